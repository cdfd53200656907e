// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Descriptors across processes, where the host runtime must not lose one: a call that the
// receiver's buffer refuses, a call to a dead peer, and frames that misstate their descriptors.
// What a process holds is read from /proc/<pid>/fd.

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_parcel_utils.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "echo_binder.h"
#include "frame_io.h"
#include "process_fixture.h"
#include "raw_peer.h"
#include "test_descriptors.h"
#include "transaction_buffer.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::IVYRService;

// The helper's echo binder `name`, associated with its class for transactions.
ndk::SpAIBinder AsEcho(ndk::SpAIBinder binder) {
    if (binder.get() != nullptr && !AIBinder_associateClass(binder.get(), EchoClass())) {
        return ndk::SpAIBinder();
    }
    return binder;
}

// Takes all of this process's transaction buffer while it lives, as other traffic in flight to
// the process would on a device: every call to it is refused.
class FullTransactionBuffer {
  public:
    FullTransactionBuffer()
        : held_(VyrBinder_holdTransactionBuffer(vyr_binder::TransactionBuffer::kBytes)) {}
    ~FullTransactionBuffer() { VyrBinder_releaseTransactionBuffer(); }
    FullTransactionBuffer(const FullTransactionBuffer&) = delete;
    FullTransactionBuffer& operator=(const FullTransactionBuffer&) = delete;
    bool held() const { return held_; }

  private:
    const bool held_;
};

// Has the helper's `echo` send `file` and `text` on to `target`'s kWriteToDescriptor: the status
// of that call, or 1 when the helper did not answer.
int32_t Forward(AIBinder* echo, AIBinder* target, const ndk::ScopedFileDescriptor& file,
                const std::string& text) {
    AParcel* in = nullptr;
    if (AIBinder_prepareTransaction(echo, &in) != STATUS_OK) return 1;
    if (AParcel_writeStrongBinder(in, target) != STATUS_OK ||
        ndk::AParcel_writeRequiredParcelFileDescriptor(in, file) != STATUS_OK ||
        ndk::AParcel_writeString(in, text) != STATUS_OK) {
        AParcel_delete(in);
        return 1;
    }
    ndk::ScopedAParcel reply;
    int32_t forwarded = 1;
    if (AIBinder_transact(echo, kForwardDescriptor, &in, reply.getR(), 0) != STATUS_OK ||
        AParcel_readInt32(reply.get(), &forwarded) != STATUS_OK) {
        return 1;
    }
    return forwarded;
}

// The helper sends this process's echo binder a call with a descriptor that the test gave it, and
// this process's full buffer refuses the call: the helper's call fails, and neither process keeps
// a copy of the descriptor, the refused frame's included.
TEST_F(CrossProcessTest, ARefusedCallLeaksNoDescriptorInEitherProcess) {
    pid_t pid = -1;
    ASSERT_NE(nullptr, StartServer("vyr.test", &pid));
    ndk::SpAIBinder echo = AsEcho(WaitForService("vyr.test.echo"));
    ASSERT_NE(nullptr, echo.get());
    ndk::SpAIBinder local = MakeEcho();
    const std::string name = "vyr.refused.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "");
    ASSERT_GE(file.get(), 0);
    {
        FullTransactionBuffer full;
        ASSERT_TRUE(full.held());
        EXPECT_EQ(STATUS_FAILED_TRANSACTION, Forward(echo.get(), local.get(), file, "refused"));
    }
    EXPECT_EQ("", ReadText(file.get())) << "the refused call was served";
    EXPECT_EQ(1u, CountOpenTextFiles(getpid(), name)) << "only the test's own is left here";
    EXPECT_TRUE(Eventually([&] { return CountOpenTextFiles(pid, name) == 0; }))
        << CountOpenTextFiles(pid, name) << " left in the helper";
    // The same call, which this process now takes, is served.
    EXPECT_EQ(STATUS_OK, Forward(echo.get(), local.get(), file, "served"));
    EXPECT_EQ("served", ReadText(file.get()));
    EXPECT_EQ(1u, CountOpenTextFiles(getpid(), name));
    EXPECT_TRUE(Eventually([&] { return CountOpenTextFiles(pid, name) == 0; }));
}

// A call to a peer that is gone fails, and the parcel that held the descriptor closes its copy.
TEST_F(CrossProcessTest, ACallToADeadPeerLeaksNoDescriptor) {
    pid_t pid = -1;
    ASSERT_NE(nullptr, StartServer("vyr.test", &pid));
    ndk::SpAIBinder echo = AsEcho(WaitForService("vyr.test.echo"));
    ASSERT_NE(nullptr, echo.get());
    const std::string name = "vyr.dead.test";
    ndk::ScopedFileDescriptor file = MakeTextFile(name, "");
    ASSERT_GE(file.get(), 0);
    Kill(pid);
    for (int i = 0; i < 2; ++i) {
        AParcel* in = nullptr;
        ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
        ASSERT_EQ(STATUS_OK, ndk::AParcel_writeNullableParcelFileDescriptor(in, file));
        EXPECT_EQ(2u, CountOpenTextFiles(getpid(), name));
        ndk::ScopedAParcel reply;
        EXPECT_EQ(STATUS_DEAD_OBJECT,
                  AIBinder_transact(echo.get(), kEchoDescriptor, &in, reply.getR(), 0));
        EXPECT_EQ(1u, CountOpenTextFiles(getpid(), name)) << "call " << i;
    }
}

// A peer that speaks the wire format by hand, with descriptors.
class DescriptorFrameTest : public CrossProcessTest {
  protected:
    void SetUp() override {
        CrossProcessTest::SetUp();
        service_ = StartServer("vyr.test", &pid_);
        ASSERT_NE(nullptr, service_);
        peer_ = std::make_unique<vyr_test::RawPeer>(registry_.path(), "vyr.test");
        ASSERT_TRUE(peer_->connected());
        ASSERT_GE(file_.get(), 0);
    }

    // A call to an object the helper never handed out, announcing `announced` descriptors and
    // carrying `count` copies of the test's file with its first byte.
    bool SendCall(uint32_t announced, size_t count) {
        vyr_binder::FrameHeader header{};
        header.magic = vyr_binder::kFrameMagic;
        header.type = static_cast<uint32_t>(vyr_binder::FrameType::kTransaction);
        header.code = FIRST_CALL_TRANSACTION;
        header.transaction_id = ++last_id_;
        header.target = 4242;
        header.descriptor_count = announced;
        // More than the runtime ever sends, so not through its own sending.
        std::vector<int> descriptors(count, file_.get());
        std::vector<char> control(CMSG_SPACE(sizeof(int) * count));
        iovec iov{&header, sizeof(header)};
        msghdr msg{};
        msg.msg_iov = &iov;
        msg.msg_iovlen = 1;
        if (count > 0) {
            msg.msg_control = control.data();
            msg.msg_controllen = control.size();
            cmsghdr* c = CMSG_FIRSTHDR(&msg);
            c->cmsg_level = SOL_SOCKET;
            c->cmsg_type = SCM_RIGHTS;
            c->cmsg_len = CMSG_LEN(sizeof(int) * count);
            std::memcpy(CMSG_DATA(c), descriptors.data(), sizeof(int) * count);
        }
        return sendmsg(peer_->fd(), &msg, MSG_NOSIGNAL) == static_cast<ssize_t>(sizeof(header));
    }

    // The status the helper answered the last call with; 1 if no answer came.
    int32_t Answer() {
        vyr_binder::Frame frame;
        while (buffer_.Fill(peer_->fd(), true) == vyr_binder::FrameBuffer::Result::kFrame) {
            buffer_.Take(&frame);
            if (frame.header.type == static_cast<uint32_t>(vyr_binder::FrameType::kReply) &&
                frame.header.transaction_id == last_id_) {
                return static_cast<int32_t>(frame.header.code);
            }
        }
        return 1;
    }

    bool HelperDropsThePeer() {
        return Eventually([&] { return peer_->HungUp(); });
    }

    bool HelperHoldsNone() {
        return Eventually([&] { return CountOpenTextFiles(pid_, kName) == 0; });
    }

    void ExpectStillServing() {
        int32_t result = 0;
        EXPECT_TRUE(service_->Open(2, &result).isOk());
        EXPECT_EQ(20, result);
    }

    static constexpr const char* kName = "vyr.frame.test";
    std::shared_ptr<IVYRService> service_;
    pid_t pid_ = -1;
    std::unique_ptr<vyr_test::RawPeer> peer_;
    vyr_binder::FrameBuffer buffer_;
    uint64_t last_id_ = 0;
    ndk::ScopedFileDescriptor file_ = MakeTextFile(kName, "");
};

// The call is answered STATUS_DEAD_OBJECT, and the descriptors that came with it are closed.
TEST_F(DescriptorFrameTest, DescriptorsSentToAnUnknownObjectAreClosed) {
    ASSERT_TRUE(SendCall(2, 2));
    EXPECT_EQ(STATUS_DEAD_OBJECT, Answer());
    EXPECT_TRUE(HelperHoldsNone()) << CountOpenTextFiles(pid_, kName) << " left in the helper";
    EXPECT_FALSE(peer_->HungUp());
    ExpectStillServing();
}

// A frame for which fewer descriptors came than it announced is malformed: the peer is dropped,
// what did come is closed, and the helper serves on.
TEST_F(DescriptorFrameTest, AFrameAnnouncingMoreDescriptorsThanCameIsDropped) {
    ASSERT_TRUE(SendCall(2, 2));
    ASSERT_EQ(STATUS_DEAD_OBJECT, Answer());
    ASSERT_TRUE(SendCall(2, 1));
    EXPECT_TRUE(HelperDropsThePeer());
    EXPECT_TRUE(HelperHoldsNone()) << CountOpenTextFiles(pid_, kName) << " left in the helper";
    ExpectStillServing();
}

// As many descriptors as a frame may carry are taken; one more drops the peer, and none is kept.
TEST_F(DescriptorFrameTest, AFrameOverTheDescriptorLimitIsDropped) {
    const size_t limit = vyr_binder::kMaxDescriptorsPerFrame;
    ASSERT_TRUE(SendCall(limit, limit));
    ASSERT_EQ(STATUS_DEAD_OBJECT, Answer());
    ASSERT_TRUE(SendCall(limit + 1, limit + 1));
    EXPECT_TRUE(HelperDropsThePeer());
    EXPECT_TRUE(HelperHoldsNone()) << CountOpenTextFiles(pid_, kName) << " left in the helper";
    ExpectStillServing();
}

}  // namespace
}  // namespace vyr_test::binder
