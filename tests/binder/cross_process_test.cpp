// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstring>
#include <future>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "binder_test_env.h"
#include "echo_binder.h"
#include "frame_io.h"
#include "process_fixture.h"
#include "raw_peer.h"
#include "test_files.h"
#include "test_service.h"
#include "thread_count.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;
using namespace std::chrono_literals;

TEST_F(CrossProcessTest, CallsReachTheOtherProcess) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    EXPECT_TRUE(service->isRemote());
    EXPECT_TRUE(AIBinder_isRemote(service->asBinder().get()));
    EXPECT_TRUE(AIBinder_isAlive(service->asBinder().get()));
    EXPECT_EQ(STATUS_OK, AIBinder_ping(service->asBinder().get()));
    int32_t result = 0;
    ASSERT_TRUE(service->Open(3, &result).isOk());
    EXPECT_EQ(30, result);
    ASSERT_TRUE(service->Enable(7, 100, &result).isOk());
    EXPECT_EQ(107, result);
    ASSERT_TRUE(service->EnableLowPower(1, false, &result).isOk());
    EXPECT_EQ(0, result);
    ASSERT_TRUE(service->ConfigureParameters(1, {5, 6, 7}, &result).isOk());
    EXPECT_EQ(18, result);
    Event event;
    ASSERT_TRUE(service->PollOnce(4, &event, &result).isOk());
    EXPECT_EQ(getpid(), result);
    EXPECT_EQ(4, event.status);
    EXPECT_EQ(1000000000004LL, event.timestamp);
    EXPECT_EQ(6.0f, event.value0);
    EXPECT_EQ(std::vector<float>(4, 0.5f), event.data);
    ndk::ScopedAStatus error = service->Disable(-3);
    EXPECT_EQ(EX_SERVICE_SPECIFIC, error.getExceptionCode());
    EXPECT_EQ(-3, error.getServiceSpecificError());
    EXPECT_STREQ("neg", error.getMessage());
}

// The caller reads its own reply: none of the runtime's threads wakes for a call. (Threads of
// sanitizer runtimes wake on their own.) A pool thread woken by replies wakes about once a call;
// two stray wake-ups over all the calls are allowed, so that the rare one seen on a loaded
// machine under ASan does not fail the test.
constexpr unsigned long kStrayWakeUps = 2;

void ExpectCallsWakeOnlyTheCaller(IVYRService& service) {
    int32_t result = 0;
    ASSERT_TRUE(service.Enable(1, 2, &result).isOk());
    std::map<pid_t, unsigned long> before = vyr_test::VoluntarySwitches("binder:");
    ASSERT_FALSE(before.empty()) << "the runtime's threads are named binder:<pid>_<n>";
    for (int i = 0; i < 200; ++i) {
        ASSERT_TRUE(service.Enable(i, 2, &result).isOk());
        ASSERT_EQ(i + 2, result);
    }
    for (const auto& [tid, switches] : vyr_test::VoluntarySwitches("binder:")) {
        if (before.count(tid) == 0) continue;
        EXPECT_LE(switches - before[tid], kStrayWakeUps)
            << "thread " << tid << " woke during the calls";
    }
}

TEST_F(CrossProcessTest, RepliesWakeNoThreadButTheirCaller) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    ExpectCallsWakeOnlyTheCaller(*service);
}

TEST_F(CrossProcessTest, RepliesWakeNoThreadButTheirCallerAlsoWhenTheProcessMayBeCalled) {
    auto local = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(local->asBinder().get(), "vyr.local"));
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    ExpectCallsWakeOnlyTheCaller(*service);
}

// A peer that held nothing of this process is watched only for its hang-up; once a name is
// published here, it can call over the connection it already has, while nobody here calls.
TEST_F(CrossProcessTest, ANamePublishedLaterIsReachedOverAnExistingConnection) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    int32_t result = 0;
    ASSERT_TRUE(service->Enable(1, 2, &result).isOk());
    auto callee = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE,
              AServiceManager_addService(callee->asBinder().get(), TestService::kCalleeName));
    ASSERT_TRUE(service->Open(TestService::kTorchCalleeLater, &result).isOk());
    EXPECT_TRUE(Eventually([&] {
        int32_t torch = 0;
        callee->Open(TestService::kQueryTorch, &torch);
        return torch == TestService::kCalleeTorch;
    })) << "the peer's call over the existing connection was never served";
}

// Watched only for its hang-up, a peer that holds nothing of this process still reports its
// death.
TEST_F(CrossProcessTest, APeerThatHoldsNothingOfOursReportsItsDeath) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    int32_t result = 0;
    ASSERT_TRUE(service->Enable(1, 2, &result).isOk());
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookie = 0;
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(service->asBinder().get(), recipient.get(), &cookie));
    Kill(pid);
    ASSERT_TRUE(DeathLog::Get().WaitFor(1));
    EXPECT_EQ(1u, DeathLog::Get().CountOf(&cookie));
}

TEST_F(CrossProcessTest, CallingIdentityComesFromThePeer) {
    StartServer("vyr.test");
    ndk::SpAIBinder echo = WaitForService("vyr.test.echo");
    ASSERT_TRUE(AIBinder_associateClass(echo.get(), vyr_test::binder::EchoClass()));
    AParcel* in = nullptr;
    AParcel* out = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
    ASSERT_EQ(STATUS_OK, AIBinder_transact(echo.get(), vyr_test::binder::kIdentity, &in, &out, 0));
    ndk::ScopedAParcel reply(out);
    int32_t uid = -1;
    int32_t pid = -1;
    ASSERT_EQ(STATUS_OK, AParcel_readInt32(reply.get(), &uid));
    ASSERT_EQ(STATUS_OK, AParcel_readInt32(reply.get(), &pid));
    EXPECT_EQ(static_cast<int32_t>(getuid()), uid);
    EXPECT_EQ(getpid(), pid);
    // Outside a transaction the caller is this process itself.
    EXPECT_EQ(getpid(), AIBinder_getCallingPid());
    EXPECT_EQ(getuid(), AIBinder_getCallingUid());
}

TEST_F(CrossProcessTest, OneAIBinderPerObjectAndOwnObjectsComeBackLocal) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ndk::SpAIBinder first(AServiceManager_checkService("vyr.test"));
    ndk::SpAIBinder second(AServiceManager_checkService("vyr.test"));
    EXPECT_EQ(first.get(), second.get());
    EXPECT_EQ(service->asBinder().get(), first.get());

    ndk::SpAIBinder echo = WaitForService("vyr.test.echo");
    ASSERT_TRUE(AIBinder_associateClass(echo.get(), vyr_test::binder::EchoClass()));
    // The IVYRService object does not answer to the echo interface.
    EXPECT_FALSE(AIBinder_associateClass(first.get(), vyr_test::binder::EchoClass()));

    auto roundtrip = [&](AIBinder* sent) {
        AParcel* in = nullptr;
        AParcel* out = nullptr;
        EXPECT_EQ(STATUS_OK, AIBinder_prepareTransaction(echo.get(), &in));
        EXPECT_EQ(STATUS_OK, AParcel_writeStrongBinder(in, sent));
        EXPECT_EQ(STATUS_OK,
                  AIBinder_transact(echo.get(), vyr_test::binder::kEchoBinder, &in, &out, 0));
        ndk::ScopedAParcel reply(out);
        ndk::SpAIBinder back;
        EXPECT_EQ(STATUS_OK, AParcel_readStrongBinder(reply.get(), back.getR()));
        return back;
    };
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    ndk::SpAIBinder local = callback->asBinder();
    EXPECT_EQ(local.get(), roundtrip(local.get()).get());
    EXPECT_EQ(first.get(), roundtrip(first.get()).get());
    EXPECT_EQ(nullptr, roundtrip(nullptr).get());
}

TEST_F(CrossProcessTest, CallbackIsCalledLaterFromAnotherThread) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    ASSERT_TRUE(service->SetCallback(0, callback, &result).isOk());
    ASSERT_TRUE(service->Close(5).isOk());
    ASSERT_TRUE(callback->WaitForEvents(5));
    EXPECT_EQ(4, callback->events()[4].status);
}

TEST_F(CrossProcessTest, ExportedObjectLivesWhileThePeerHoldsIt) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    std::weak_ptr<RecordingCallback> weak;
    {
        auto callback = ndk::SharedRefBase::make<RecordingCallback>();
        weak = callback;
        int32_t result = 0;
        ASSERT_TRUE(service->SetCallback(0, callback, &result).isOk());
    }
    // Only the peer holds it now.
    ASSERT_TRUE(service->Close(1).isOk());
    ASSERT_TRUE(Eventually([&] {
        auto callback = weak.lock();
        return callback != nullptr && callback->events().size() == 1;
    }));
    int32_t result = 0;
    ASSERT_TRUE(service->SetCallback(0, nullptr, &result).isOk());
    EXPECT_EQ(-22, result);
    EXPECT_TRUE(Eventually([&] { return weak.expired(); }));
}

TEST_F(CrossProcessTest, OnewayCallsArrive) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    for (int32_t state = 1; state <= 20; ++state) {
        AParcel* in = nullptr;
        AParcel* out = nullptr;
        ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(binder, &in));
        ASSERT_EQ(STATUS_OK, AParcel_writeInt32(in, state));
        ASSERT_EQ(STATUS_OK,
                  AIBinder_transact(binder, FIRST_CALL_TRANSACTION + 8, &in, &out, FLAG_ONEWAY));
        ndk::ScopedAParcel reply(out);
    }
    // Oneway calls to one object run in order, so the last one sent is the last one applied.
    EXPECT_TRUE(Eventually([&] {
        int32_t state = 0;
        return service->Open(TestService::kQueryTorch, &state).isOk() && state == 20;
    }));
}

// More than one read takes, all in the socket at once: the rest is read as well, though no new
// byte comes to wake anyone.
TEST_F(CrossProcessTest, ABurstLargerThanOneReadIsServedWhole) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service->asBinder().get(), "vyr.local"));
    vyr_test::RawPeer peer(registry_.path(), "vyr.local");
    ASSERT_TRUE(peer.connected());
    const uint64_t target = peer.LookUp("vyr.local");
    ASSERT_NE(0u, target);
    // SetTorchLightState, the interface's ninth method.
    constexpr int32_t kCalls = 400;
    ASSERT_TRUE(peer.SendOnewayBurst(target, IVYRService::descriptor, 8, kCalls));
    EXPECT_TRUE(Eventually([&] {
        int32_t state = 0;
        return service->Open(TestService::kQueryTorch, &state).isOk() && state == kCalls;
    }));
}

TEST_F(CrossProcessTest, SixteenThreadsCallAtOnce) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    std::atomic<int> failures{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 16; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 200; ++i) {
                int32_t result = 0;
                if (!service->Enable(t * 1000, i, &result).isOk() || result != t * 1000 + i) {
                    ++failures;
                }
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, failures.load());
}

TEST_F(CrossProcessTest, PeerDeathDuringManyCallsFailsEveryOneOfThem) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    std::atomic<int> calls{0};
    std::atomic<int> bad_status{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 8; ++t) {
        threads.emplace_back([&] {
            for (;;) {
                int32_t result = 0;
                binder_status_t status = service->Enable(1, 2, &result).getStatus();
                if (status == STATUS_DEAD_OBJECT) return;
                if (status != STATUS_OK) ++bad_status;
                ++calls;
            }
        });
    }
    ASSERT_TRUE(Eventually([&] { return calls.load() > 200; }));
    Kill(pid);
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, bad_status.load());
    EXPECT_FALSE(AIBinder_isAlive(service->asBinder().get()));
}

TEST_F(CrossProcessTest, CallbacksAndCallsCrossEachOther) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    ASSERT_TRUE(service->SetCallback(0, callback, &result).isOk());
    // The service pushes events from its own thread while this side keeps calling it.
    ASSERT_TRUE(service->Close(300).isOk());
    std::vector<std::thread> threads;
    std::atomic<int> failures{0};
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&] {
            for (int i = 0; i < 100; ++i) {
                int32_t r = 0;
                if (!service->Open(i, &r).isOk() || r != i * 10) ++failures;
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(0, failures.load());
    ASSERT_TRUE(callback->WaitForEvents(300));
    std::vector<Event> events = callback->events();
    ASSERT_EQ(300u, events.size());
    // One sender thread, two-way calls: they arrive in order.
    for (size_t i = 0; i < events.size(); ++i) {
        EXPECT_EQ(1000000000000LL + static_cast<int64_t>(i), events[i].timestamp);
    }
}

TEST_F(CrossProcessTest, ObjectsHeldOnlyByADeadPeerAreReleased) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> service = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, service);
    std::weak_ptr<RecordingCallback> weak;
    {
        auto callback = ndk::SharedRefBase::make<RecordingCallback>();
        weak = callback;
        int32_t result = 0;
        ASSERT_TRUE(service->SetCallback(0, callback, &result).isOk());
    }
    EXPECT_FALSE(weak.expired());
    Kill(pid);
    EXPECT_TRUE(Eventually([&] { return weak.expired(); }));
}

// Only the owner may reach a process's socket, and a peer of another user is turned away even
// when the file modes would let it in.
TEST_F(CrossProcessTest, OtherUsersCannotConnect) {
    auto service = ndk::SharedRefBase::make<TestService>();
    ASSERT_EQ(EX_NONE, AServiceManager_addService(service->asBinder().get(), "vyr.local"));
    char key[256] = {};
    std::string entry = registry_.path() + "/svc.vyr.local";
    ASSERT_GT(readlink(entry.c_str(), key, sizeof(key) - 1), 0);
    std::string path = registry_.path() + "/" + key + ".sock";
    struct stat st;
    ASSERT_EQ(0, stat(path.c_str(), &st));
    EXPECT_EQ(0600u, st.st_mode & 0777);
    ASSERT_EQ(0, stat(registry_.path().c_str(), &st));
    EXPECT_EQ(0u, st.st_mode & 077);

    if (geteuid() != 0) {
        if (getenv("CI") != nullptr && std::string(getenv("CI")) == "true") {
            GTEST_FAIL() << "connecting as another user needs root";
        }
        GTEST_SKIP() << "connecting as another user needs root";
    }
    // Open the modes so that only the credential check stands in the way.
    ASSERT_EQ(0, chmod(registry_.path().c_str(), 0755));
    ASSERT_EQ(0, chmod(path.c_str(), 0666));
    pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        // Only async-signal-safe calls here.
        if (setgid(65534) != 0 || setuid(65534) != 0) _exit(10);
        sockaddr_un addr{};
        addr.sun_family = AF_UNIX;
        memcpy(addr.sun_path, path.c_str(), path.size() + 1);
        int fd = socket(AF_UNIX, SOCK_STREAM, 0);
        if (connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) != 0) _exit(11);
        char byte;
        // Refused: the runtime closes the connection without a word.
        ssize_t n = read(fd, &byte, 1);
        _exit(n == 0 ? 0 : 12);
    }
    int status = -1;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(0, WEXITSTATUS(status));
}

TEST_F(CrossProcessTest, MissingServicesAreNull) {
    EXPECT_EQ(nullptr, AServiceManager_checkService("vyr.missing"));
    EXPECT_EQ(nullptr, AServiceManager_checkService("bad name"));
}

TEST_F(CrossProcessTest, WaitForServiceWaitsForTheName) {
    std::thread starter([&] {
        std::this_thread::sleep_for(100ms);
        Spawn("serve", "vyr.late");
    });
    ndk::SpAIBinder binder(AServiceManager_waitForService("vyr.late"));
    starter.join();
    ASSERT_NE(nullptr, binder.get());
    EXPECT_TRUE(AIBinder_isRemote(binder.get()));
}

TEST_F(CrossProcessTest, WaitForServiceWakesWhenTheServiceRegistersAgain) {
    pid_t pid = -1;
    std::shared_ptr<IVYRService> first = StartServer("vyr.test", &pid);
    ASSERT_NE(nullptr, first);
    Kill(pid);
    ASSERT_TRUE(Eventually([&] { return !AIBinder_isAlive(first->asBinder().get()); }));
    std::promise<ndk::SpAIBinder> found;
    std::future<ndk::SpAIBinder> waited = found.get_future();
    // Waits while the name is left only by a dead process.
    std::thread waiter(
        [&found] { found.set_value(ndk::SpAIBinder(AServiceManager_waitForService("vyr.test"))); });
    Spawn("serve", "vyr.test");
    ASSERT_EQ(std::future_status::ready, waited.wait_for(10s));
    waiter.join();
    ndk::SpAIBinder second = waited.get();
    ASSERT_NE(nullptr, second.get());
    EXPECT_NE(first->asBinder().get(), second.get());
    EXPECT_TRUE(AIBinder_isAlive(second.get()));
    EXPECT_EQ(STATUS_OK, AIBinder_ping(second.get()));
}

TEST_F(CrossProcessTest, WrongInterfaceTokenIsRefusedRemotely) {
    std::shared_ptr<IVYRService> service = StartServer("vyr.test");
    ASSERT_NE(nullptr, service);
    AIBinder* binder = service->asBinder().get();
    AParcel* in = nullptr;
    AParcel* out = nullptr;
    ASSERT_EQ(STATUS_OK, AIBinder_prepareTransaction(binder, &in));
    ASSERT_EQ(STATUS_OK, AParcel_setDataPosition(in, 0));
    ASSERT_EQ(STATUS_OK, AParcel_writeInt32(in, 12345));
    EXPECT_EQ(STATUS_BAD_TYPE, AIBinder_transact(binder, FIRST_CALL_TRANSACTION, &in, &out, 0));
    int32_t result = 0;
    EXPECT_TRUE(service->Open(1, &result).isOk());
}

// Frames written by hand straight to a helper's socket: the helper must drop that connection
// and keep serving everyone else.
class MalformedFrameTest : public CrossProcessTest {
  protected:
    void SetUp() override {
        CrossProcessTest::SetUp();
        service_ = StartServer("vyr.test", &pid_);
        ASSERT_NE(nullptr, service_);
    }

    int ConnectRaw() {
        char key[256] = {};
        std::string entry = registry_.path() + "/svc.vyr.test";
        if (readlink(entry.c_str(), key, sizeof(key) - 1) <= 0) return -1;
        std::string path = registry_.path() + "/" + key + ".sock";
        sockaddr_un addr{};
        addr.sun_family = AF_UNIX;
        std::memcpy(addr.sun_path, path.c_str(), path.size() + 1);
        int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) != 0) {
            close(fd);
            return -1;
        }
        return fd;
    }

    static void SendBytes(int fd, const void* bytes, size_t size) {
        ASSERT_EQ(static_cast<ssize_t>(size), send(fd, bytes, size, MSG_NOSIGNAL));
    }

    static vyr_binder::FrameHeader Header(vyr_binder::FrameType type) {
        vyr_binder::FrameHeader header{};
        header.magic = vyr_binder::kFrameMagic;
        header.type = static_cast<uint32_t>(type);
        header.transaction_id = 1;
        return header;
    }

    // True when the helper closed the connection (after its HELLO, which is skipped).
    static bool ClosedByPeer(int fd) {
        char buffer[4096];
        auto deadline = std::chrono::steady_clock::now() + 10s;
        while (std::chrono::steady_clock::now() < deadline) {
            pollfd p{fd, POLLIN, 0};
            if (poll(&p, 1, 100) <= 0) continue;
            ssize_t n = recv(fd, buffer, sizeof(buffer), 0);
            if (n <= 0) return true;
        }
        return false;
    }

    void ExpectStillServing() {
        int status = 0;
        EXPECT_EQ(0, waitpid(pid_, &status, WNOHANG));
        int32_t result = 0;
        EXPECT_TRUE(service_->Open(2, &result).isOk());
        EXPECT_EQ(20, result);
    }

    std::shared_ptr<IVYRService> service_;
    pid_t pid_ = -1;
};

TEST_F(MalformedFrameTest, GarbageClosesOnlyThatConnection) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    std::vector<uint8_t> garbage(300, 0xab);
    SendBytes(fd, garbage.data(), garbage.size());
    EXPECT_TRUE(ClosedByPeer(fd));
    close(fd);
    ExpectStillServing();
}

TEST_F(MalformedFrameTest, TruncatedFrameClosesOnlyThatConnection) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    vyr_binder::FrameHeader header = Header(vyr_binder::FrameType::kTransaction);
    header.target = 1;
    header.data_size = 100;
    SendBytes(fd, &header, sizeof(header));
    SendBytes(fd, "0123456789", 10);
    shutdown(fd, SHUT_WR);
    EXPECT_TRUE(ClosedByPeer(fd));
    close(fd);
    ExpectStillServing();
}

TEST_F(MalformedFrameTest, OversizedFrameIsRefusedBeforeReadingIt) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    vyr_binder::FrameHeader header = Header(vyr_binder::FrameType::kTransaction);
    header.data_size = 64u << 20;
    SendBytes(fd, &header, sizeof(header));
    EXPECT_TRUE(ClosedByPeer(fd));
    close(fd);
    ExpectStillServing();
}

TEST_F(MalformedFrameTest, ReferenceToAnObjectNeverHandedOutClosesTheConnection) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    std::vector<uint8_t> table;
    vyr_binder::EncodeObjects({{vyr_binder::ObjectKind::kReceiverObject, 12345, {}}}, &table);
    vyr_binder::FrameHeader header = Header(vyr_binder::FrameType::kTransaction);
    header.target = 1;
    header.object_count = 1;
    header.table_size = static_cast<uint32_t>(table.size());
    SendBytes(fd, &header, sizeof(header));
    SendBytes(fd, table.data(), table.size());
    EXPECT_TRUE(ClosedByPeer(fd));
    close(fd);
    ExpectStillServing();
}

TEST_F(MalformedFrameTest, ReplyToNothingClosesTheConnection) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    vyr_binder::FrameHeader header = Header(vyr_binder::FrameType::kReply);
    header.transaction_id = 999;
    SendBytes(fd, &header, sizeof(header));
    EXPECT_TRUE(ClosedByPeer(fd));
    close(fd);
    ExpectStillServing();
}

TEST_F(MalformedFrameTest, CallToUnknownObjectIsAnsweredDeadObject) {
    int fd = ConnectRaw();
    ASSERT_GE(fd, 0);
    vyr_binder::FrameHeader header = Header(vyr_binder::FrameType::kTransaction);
    header.target = 4242;
    header.code = FIRST_CALL_TRANSACTION;
    SendBytes(fd, &header, sizeof(header));
    // The helper's HELLO, then the reply.
    vyr_binder::FrameBuffer buffer;
    vyr_binder::Frame frame;
    ASSERT_EQ(vyr_binder::FrameBuffer::Result::kFrame, buffer.Fill(fd, true));
    buffer.Take(&frame);
    EXPECT_EQ(static_cast<uint32_t>(vyr_binder::FrameType::kHello), frame.header.type);
    ASSERT_EQ(vyr_binder::FrameBuffer::Result::kFrame, buffer.Fill(fd, true));
    buffer.Take(&frame);
    EXPECT_EQ(static_cast<uint32_t>(vyr_binder::FrameType::kReply), frame.header.type);
    EXPECT_EQ(static_cast<uint32_t>(STATUS_DEAD_OBJECT), frame.header.code);
    close(fd);
    ExpectStillServing();
}

// The dump transaction: a descriptor and arguments from the caller to the service's dump.
class DumpTransactionTest : public MalformedFrameTest {
  protected:
    // Runs a dump into a pipe and returns its status; the text read is left in `text`.
    binder_status_t Dump(const std::vector<const char*>& args, std::string* text) {
        int fds[2];
        EXPECT_EQ(0, pipe2(fds, O_CLOEXEC));
        std::string read_text;
        std::thread reader([&] { read_text = ReadAll(fds[0]); });
        const binder_status_t status =
            AIBinder_dump(service_->asBinder().get(), fds[1], const_cast<const char**>(args.data()),
                          static_cast<uint32_t>(args.size()));
        close(fds[1]);
        reader.join();
        close(fds[0]);
        *text = read_text;
        return status;
    }

    static std::string ReadAll(int fd) {
        std::string text;
        char buffer[4096];
        ssize_t n;
        while ((n = read(fd, buffer, sizeof(buffer))) > 0) text.append(buffer, n);
        return text;
    }
};

TEST_F(DumpTransactionTest, TheServiceWritesToTheCallersDescriptorWithItsArguments) {
    std::string text;
    EXPECT_EQ(STATUS_OK, Dump({"--json", "two words"}, &text));
    EXPECT_EQ("dump: --json two words\n", text);
    EXPECT_EQ(STATUS_OK, Dump({}, &text));
    EXPECT_EQ("dump:\n", text);
    ExpectStillServing();
}

TEST_F(DumpTransactionTest, BadDescriptorsAreRefusedAndTheServiceServesOn) {
    EXPECT_EQ(STATUS_BAD_VALUE, AIBinder_dump(service_->asBinder().get(), -1, nullptr, 0));
    int fds[2];
    ASSERT_EQ(0, pipe(fds));
    close(fds[0]);
    close(fds[1]);
    EXPECT_EQ(STATUS_BAD_VALUE, AIBinder_dump(service_->asBinder().get(), fds[1], nullptr, 0));
    const char* null_arg[] = {nullptr};
    ASSERT_EQ(0, pipe(fds));
    EXPECT_EQ(STATUS_UNEXPECTED_NULL,
              AIBinder_dump(service_->asBinder().get(), fds[1], null_arg, 1));
    close(fds[0]);
    close(fds[1]);
    ExpectStillServing();
}

TEST_F(DumpTransactionTest, AReaderThatClosesEarlyCostsTheServiceNothing) {
    int fds[2];
    ASSERT_EQ(0, pipe2(fds, O_CLOEXEC));
    // The reader takes the first line and goes; the rest of the 4 MiB has nowhere to go.
    std::thread reader([&] {
        char buffer[16];
        EXPECT_GT(read(fds[0], buffer, sizeof(buffer)), 0);
        close(fds[0]);
    });
    const char* args[] = {"big"};
    const binder_status_t status = AIBinder_dump(service_->asBinder().get(), fds[1], args, 1);
    reader.join();
    close(fds[1]);
    EXPECT_EQ(-EPIPE, status) << "the service's write met a closed pipe";
    ExpectStillServing();
}

TEST_F(DumpTransactionTest, ADumpRacingTheServicesDeathEndsWithTheDeathNotice) {
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(DeathLog::OnDied));
    int cookie = 0;
    ASSERT_EQ(STATUS_OK, AIBinder_linkToDeath(service_->asBinder().get(), recipient.get(), &cookie));
    int fds[2];
    ASSERT_EQ(0, pipe2(fds, O_CLOEXEC));
    std::string text;
    std::atomic<bool> writing{false};
    std::thread reader([&] {
        char buffer[4096];
        ssize_t n;
        while ((n = read(fds[0], buffer, sizeof(buffer))) > 0) {
            text.append(buffer, n);
            writing = true;
        }
    });
    // Killed once the dump has begun writing.
    std::thread killer([&] {
        const auto deadline = std::chrono::steady_clock::now() + 10s;
        while (!writing && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(1ms);
        }
        kill(pid_, SIGKILL);
    });
    const char* args[] = {"slow"};
    EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_dump(service_->asBinder().get(), fds[1], args, 1));
    killer.join();
    close(fds[1]);
    reader.join();
    close(fds[0]);
    EXPECT_EQ(0u, text.rfind("dump: slow\n", 0)) << text;
    ASSERT_TRUE(DeathLog::Get().WaitFor(1));
    EXPECT_EQ(1u, DeathLog::Get().CountOf(&cookie));
    EXPECT_EQ(STATUS_DEAD_OBJECT, AIBinder_dump(service_->asBinder().get(), 1, nullptr, 0));
}

// Peers that hold the helper's resources: what they may take is bounded, and nobody else waits
// for them.
class PeerLimitTest : public MalformedFrameTest {
  protected:
    std::unique_ptr<vyr_test::RawPeer> Peer() {
        auto peer = std::make_unique<vyr_test::RawPeer>(registry_.path(), "vyr.test");
        EXPECT_TRUE(peer->connected());
        return peer;
    }

    // Resident memory of the helper, in KiB.
    long HelperRssKib() { return ResidentKib(pid_); }

    static void WaitForHangUp(const vyr_test::RawPeer& peer) {
        auto deadline = std::chrono::steady_clock::now() + 10s;
        while (!peer.HungUp() && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(5ms);
        }
    }

    // Sends Open calls without ever reading a reply, until `count` were sent or the helper
    // stops taking them; the number sent.
    static size_t SendCallsWithoutReading(vyr_test::RawPeer* peer, uint64_t target, size_t count) {
        size_t sent = 0;
        auto deadline = std::chrono::steady_clock::now() + 20s;
        while (sent < count && std::chrono::steady_clock::now() < deadline && !peer->HungUp()) {
            if (peer->SendCall(target, 100 + sent, IVYRService::descriptor, 0, {1}, 0, false)) {
                ++sent;
            } else {
                std::this_thread::sleep_for(1ms);
            }
        }
        return sent;
    }
};

TEST_F(PeerLimitTest, HeadersAnnouncingHugeFramesDoNotReserveMemory) {
    const long before = HelperRssKib();
    ASSERT_GT(before, 0);
    std::vector<std::unique_ptr<vyr_test::RawPeer>> peers;
    for (int i = 0; i < 200; ++i) {
        peers.push_back(Peer());
        ASSERT_TRUE(peers.back()->SendHeaderOnly(vyr_binder::kMaxTransactionBytes));
    }
    // Every header has been read by the helper, which now waits for the rest of each frame.
    auto deadline = std::chrono::steady_clock::now() + 10s;
    for (const auto& peer : peers) {
        while (peer->Unread() != 0 && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(1ms);
        }
        ASSERT_EQ(peer->Unread(), 0) << "the helper never read a header";
    }
    const long after = HelperRssKib();
    // 200 frames of 1 MiB would be 200 MiB; what arrived is 200 headers. ThreadSanitizer's
    // allocator and shadow memory blur resident size, so only other builds can tell.
#if defined(__SANITIZE_THREAD__)
    printf("helper RSS %ld KiB before, %ld KiB after\n", before, after);
#else
    EXPECT_LT(after - before, 16 * 1024) << before << " KiB before, " << after << " KiB after";
#endif
    ExpectStillServing();
}

TEST_F(PeerLimitTest, APeerThatDoesNotReadItsRepliesDelaysNobody) {
    auto peer = Peer();
    const uint64_t target = peer->LookUp("vyr.test");
    ASSERT_NE(target, 0u);
    // Far more replies than a socket buffer holds, all left unread.
    ASSERT_EQ(SendCallsWithoutReading(peer.get(), target, 20000), 20000u);
    ASSERT_FALSE(peer->HungUp());
    // Others are served while the stalled peer is still connected: nobody waited for it to be
    // dropped.
    for (int i = 0; i < 50; ++i) ExpectStillServing();
    EXPECT_FALSE(peer->HungUp()) << "the stalled peer was dropped before the others were served";
}

// A peer that floods oneway calls without waiting for the answers: the helper's buffer bounds
// what waits, the rest is refused, and the peer stays connected, as on a device.
TEST_F(PeerLimitTest, AFloodOfOnewayCallsIsBoundedByTheBuffer) {
    auto peer = Peer();
    const uint64_t target = peer->LookUp("vyr.test");
    ASSERT_NE(target, 0u);
    const long before = HelperRssKib();
    // The first oneway call never returns, so every later one to the object waits behind it.
    ASSERT_TRUE(peer->SendCall(target, 2, IVYRService::descriptor, 5,
                               {TestService::kBlockForever, 1}, FLAG_ONEWAY));
    for (uint64_t id = 3; id < 30000 && !peer->HungUp(); ++id) {
        ASSERT_TRUE(peer->SendCall(target, id, IVYRService::descriptor, 0, {1}, FLAG_ONEWAY));
    }
    ExpectStillServing();
    EXPECT_FALSE(peer->HungUp());
#if !defined(__SANITIZE_THREAD__) && !defined(__SANITIZE_ADDRESS__)
    // Half a mebibyte of calls waits; the sanitizers' allocators blur resident size.
    EXPECT_LT(HelperRssKib() - before, 16 * 1024);
#else
    (void)before;
#endif
}

TEST_F(PeerLimitTest, APeerWhoseUnreadRepliesPileUpIsDropped) {
    auto peer = Peer();
    const uint64_t target = peer->LookUp("vyr.test");
    ASSERT_NE(target, 0u);
    SendCallsWithoutReading(peer.get(), target, 200000);
    WaitForHangUp(*peer);
    EXPECT_TRUE(peer->HungUp()) << "replies pile up without bound";
    peer.reset();
    ExpectStillServing();
}

}  // namespace
}  // namespace vyr_test::binder
