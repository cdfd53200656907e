// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "raw_peer.h"

#include <android/binder_parcel_utils.h>
#include <linux/sockios.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>

#include "binder.h"
#include "frame_io.h"
#include "parcel.h"
#include "wire.h"

namespace vyr_test {
namespace {

// Name lookup on the process object (id 0), as the runtime's own service manager asks.
constexpr uint32_t kLookupCode = 1;
constexpr uint64_t kLookupId = 1;

vyr_binder::FrameHeader Header(uint32_t code, uint64_t id, uint64_t target, uint32_t flags,
                               size_t data_size) {
    vyr_binder::FrameHeader header{};
    header.magic = vyr_binder::kFrameMagic;
    header.type = static_cast<uint32_t>(vyr_binder::FrameType::kTransaction);
    header.code = code;
    header.flags = flags;
    header.transaction_id = id;
    header.target = target;
    header.data_size = static_cast<uint32_t>(data_size);
    return header;
}

// Appends `header` and the parcel's data to `bytes`.
void AppendFrame(const vyr_binder::FrameHeader& header, const AParcel& parcel,
                 std::vector<uint8_t>* bytes) {
    const uint8_t* raw = reinterpret_cast<const uint8_t*>(&header);
    bytes->insert(bytes->end(), raw, raw + sizeof(header));
    bytes->insert(bytes->end(), parcel.data.begin(), parcel.data.end());
}

// A call of interface method `index` of `descriptor` with int32 arguments, as a generated proxy
// sends it.
void AppendCall(uint64_t target, uint64_t id, const std::string& descriptor, uint32_t index,
                const std::vector<int32_t>& args, uint32_t flags, std::vector<uint8_t>* bytes) {
    AParcel* parcel = AParcel_create();
    AParcel_writeInt32(parcel, vyr_binder::kInterfaceTokenMarker);
    ndk::AParcel_writeString(parcel, descriptor);
    for (int32_t arg : args) AParcel_writeInt32(parcel, arg);
    AppendFrame(Header(FIRST_CALL_TRANSACTION + index, id, target, flags, parcel->data.size()),
                *parcel, bytes);
    AParcel_delete(parcel);
}

// Whole or not at all; without `wait`, only if the socket has room now.
bool SendBytes(int fd, const std::vector<uint8_t>& bytes, bool wait) {
    if (!wait) {
        pollfd p{fd, POLLOUT, 0};
        if (poll(&p, 1, 0) != 1 || (p.revents & POLLOUT) == 0) return false;
    }
    return send(fd, bytes.data(), bytes.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
}

}  // namespace

RawPeer::RawPeer(const std::string& registry_dir, const std::string& service) {
    char key[256] = {};
    const std::string entry = registry_dir + "/svc." + service;
    if (readlink(entry.c_str(), key, sizeof(key) - 1) <= 0) return;
    const std::string path = registry_dir + "/" + key + ".sock";
    sockaddr_un addr{};
    if (path.size() >= sizeof(addr.sun_path)) return;
    addr.sun_family = AF_UNIX;
    std::memcpy(addr.sun_path, path.c_str(), path.size() + 1);
    fd_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd_ >= 0 && connect(fd_, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) != 0) {
        close(fd_);
        fd_ = -1;
    }
}

RawPeer::~RawPeer() {
    if (fd_ >= 0) close(fd_);
}

uint64_t RawPeer::LookUp(const std::string& service) {
    AParcel* request = AParcel_create();
    ndk::AParcel_writeString(request, service);
    std::vector<uint8_t> bytes;
    AppendFrame(Header(kLookupCode, kLookupId, 0, 0, request->data.size()), *request, &bytes);
    AParcel_delete(request);
    if (!SendBytes(fd_, bytes, true)) return 0;
    vyr_binder::FrameBuffer buffer;
    vyr_binder::Frame frame;
    while (buffer.Fill(fd_, true) == vyr_binder::FrameBuffer::Result::kFrame) {
        buffer.Take(&frame);
        if (frame.header.type != static_cast<uint32_t>(vyr_binder::FrameType::kReply) ||
            frame.header.transaction_id != kLookupId) {
            continue;
        }
        std::vector<vyr_binder::WireObject> objects;
        if (!vyr_binder::DecodeObjects(frame.table.data(), frame.table.size(),
                                       frame.header.object_count, &objects) ||
            objects.empty()) {
            return 0;
        }
        return objects[0].id;
    }
    return 0;
}

bool RawPeer::SendHeaderOnly(uint32_t data_size) {
    const vyr_binder::FrameHeader header = Header(FIRST_CALL_TRANSACTION, 1, 1, 0, data_size);
    return send(fd_, &header, sizeof(header), MSG_NOSIGNAL) == sizeof(header);
}

bool RawPeer::SendCall(uint64_t target, uint64_t id, const std::string& descriptor, uint32_t index,
                       const std::vector<int32_t>& args, uint32_t flags, bool wait) {
    std::vector<uint8_t> frame;
    AppendCall(target, id, descriptor, index, args, flags, &frame);
    return SendBytes(fd_, frame, wait);
}

bool RawPeer::SendOnewayBurst(uint64_t target, const std::string& descriptor, uint32_t index,
                              int32_t count) {
    std::vector<uint8_t> burst;
    for (int32_t value = 1; value <= count; ++value) {
        AppendCall(target, 0, descriptor, index, {value}, FLAG_ONEWAY, &burst);
    }
    return SendBytes(fd_, burst, true);
}

int RawPeer::Unread() const {
    int bytes = -1;
    ioctl(fd_, SIOCOUTQ, &bytes);
    return bytes;
}

bool RawPeer::HungUp() const {
    pollfd p{fd_, POLLRDHUP, 0};
    return poll(&p, 1, 0) == 1 && (p.revents & (POLLHUP | POLLRDHUP)) != 0;
}

}  // namespace vyr_test
