// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Feeds arbitrary bytes to the runtime's decoders. The first byte picks the target:
//   0: frame headers and object tables
//   1: a byte stream from a peer, through a real connection, with descriptors on its first byte
//      (as many as its first byte says, modulo 4)
//   2: a transaction to a local IVYRService (the generated unmarshalling and parcel reads)
//   3: a parcel read value by value, the next byte choosing each read; the parcel holds two
//      descriptors that its entries may name
#include <aidl/android/vyr/BnVYRService.h>
#include <android/binder_parcel_utils.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include "connection.h"
#include "frame_io.h"
#include "looper.h"
#include "parcel.h"
#include "process_state.h"
#include "wire.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::BnVYRService;
using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

class NullService : public BnVYRService {
  public:
    ndk::ScopedAStatus Open(int32_t, int32_t* r) override { return Ok(r); }
    ndk::ScopedAStatus Close(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus Enable(int32_t, int32_t, int32_t* r) override { return Ok(r); }
    ndk::ScopedAStatus Disable(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus SetCallback(int32_t, const std::shared_ptr<IEventCallback>&,
                                   int32_t* r) override {
        return Ok(r);
    }
    ndk::ScopedAStatus EnableLowPower(int32_t, bool, int32_t* r) override { return Ok(r); }
    ndk::ScopedAStatus PollOnce(int32_t, Event* event, int32_t* r) override {
        event->data.assign(3, 1.0f);
        return Ok(r);
    }
    ndk::ScopedAStatus ConfigureParameters(int32_t, const std::vector<int32_t>&,
                                           int32_t* r) override {
        return Ok(r);
    }
    ndk::ScopedAStatus SetTorchLightState(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus EnableOnSample(int32_t, int32_t, int32_t, int32_t* r) override {
        return Ok(r);
    }
    ndk::ScopedAStatus Flush(int32_t, int32_t* r) override { return Ok(r); }
    ndk::ScopedAStatus EnableRing(int32_t, int32_t, ndk::ScopedFileDescriptor* ring,
                                  int32_t* r) override {
        ring->set(memfd_create("fuzz.ring", MFD_CLOEXEC));
        return Ok(r);
    }

  private:
    static ndk::ScopedAStatus Ok(int32_t* r) {
        *r = 0;
        return ndk::ScopedAStatus::ok();
    }
};

void FuzzWire(const uint8_t* data, size_t size) {
    vyr_binder::FrameHeader header;
    if (size < sizeof(header)) return;
    std::memcpy(&header, data, sizeof(header));
    vyr_binder::ValidateHeader(header);
    std::vector<vyr_binder::WireObject> objects;
    vyr_binder::DecodeObjects(data + sizeof(header), size - sizeof(header), header.object_count,
                              &objects);
}

// Descriptors to send or to hold in a parcel: each reads as an empty file.
std::vector<ndk::ScopedFileDescriptor> Descriptors(size_t count) {
    std::vector<ndk::ScopedFileDescriptor> descriptors;
    for (size_t i = 0; i < count; ++i) {
        descriptors.emplace_back(memfd_create("fuzz.descriptor", MFD_CLOEXEC));
    }
    return descriptors;
}

void FuzzConnection(const uint8_t* data, size_t size) {
    if (size < 1) return;
    const std::vector<ndk::ScopedFileDescriptor> descriptors = Descriptors(data[0] % 4);
    ++data;
    --size;
    int fds[2];
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds) != 0) return;
    vyr_binder::Looper& looper = vyr_binder::ProcessState::Get().looper();
    auto connection = std::make_shared<vyr_binder::Connection>(fds[0]);
    looper.Add(connection);
    // As a connection a peer opened: everything it sends is read.
    connection->Watch(true);
    connection.reset();
    size_t sent = 0;
    while (sent < size) {
        iovec rest{const_cast<uint8_t*>(data) + sent, size - sent};
        size_t taken = 0;
        // Blocking sends: the runtime reads as it goes.
        pollfd writable{fds[1], POLLOUT, 0};
        poll(&writable, 1, -1);
        const bool more = sent == 0 ? vyr_binder::SendSome(fds[1], &rest, 1, &taken, descriptors)
                                    : vyr_binder::SendSome(fds[1], &rest, 1, &taken);
        if (!more) break;
        sent += taken;
    }
    shutdown(fds[1], SHUT_WR);
    // Whatever the runtime answers is read and dropped until it closes its end.
    char sink[4096];
    while (read(fds[1], sink, sizeof(sink)) > 0) {
    }
    close(fds[1]);
    looper.WaitForNoConnections();
}

void FuzzTransact(const uint8_t* data, size_t size) {
    static std::shared_ptr<NullService> service = ndk::SharedRefBase::make<NullService>();
    if (size < 1) return;
    ndk::SpAIBinder binder = service->asBinder();
    transaction_code_t code = FIRST_CALL_TRANSACTION + data[0] % 10;
    AParcel* in = nullptr;
    if (AIBinder_prepareTransaction(binder.get(), &in) != STATUS_OK) return;
    in->data.insert(in->data.end(), data + 1, data + size);
    AParcel* out = nullptr;
    if (AIBinder_transact(binder.get(), code, &in, &out, 0) == STATUS_OK) AParcel_delete(out);
}

void FuzzReads(const uint8_t* data, size_t size) {
    if (size < 1) return;
    size_t split = data[0] % (size);
    ndk::ScopedAParcel parcel(AParcel_create());
    parcel.get()->data.assign(data + split, data + size);
    parcel.get()->fds = Descriptors(2);
    const AParcel* p = parcel.get();
    for (size_t i = 1; i < split; ++i) {
        switch (data[i] % 15) {
            case 0: {
                int32_t v;
                AParcel_readInt32(p, &v);
                break;
            }
            case 1: {
                int64_t v;
                AParcel_readInt64(p, &v);
                break;
            }
            case 2: {
                std::string v;
                ndk::AParcel_readString(p, &v);
                break;
            }
            case 3: {
                std::optional<std::string> v;
                ndk::AParcel_readString(p, &v);
                break;
            }
            case 4: {
                std::vector<float> v;
                ndk::AParcel_readVector(p, &v);
                break;
            }
            case 5: {
                std::vector<bool> v;
                ndk::AParcel_readVector(p, &v);
                break;
            }
            case 6: {
                std::vector<std::string> v;
                ndk::AParcel_readVector(p, &v);
                break;
            }
            case 7: {
                std::vector<uint8_t> v;
                ndk::AParcel_readVector(p, &v);
                break;
            }
            case 8: {
                ndk::ScopedAStatus status;
                AParcel_readStatusHeader(p, status.getR());
                break;
            }
            case 9: {
                ndk::SpAIBinder binder;
                AParcel_readStrongBinder(p, binder.getR());
                break;
            }
            case 10: {
                Event event;
                event.readFromParcel(p);
                break;
            }
            case 11: {
                std::vector<Event> events;
                ndk::AParcel_readVector(p, &events);
                break;
            }
            case 12:
                AParcel_setDataPosition(p, static_cast<int32_t>(data[i]) * 4);
                break;
            case 13: {
                ndk::ScopedFileDescriptor v;
                ndk::AParcel_readNullableParcelFileDescriptor(p, &v);
                break;
            }
            default: {
                std::optional<std::vector<int64_t>> v;
                ndk::AParcel_readVector(p, &v);
                break;
            }
        }
    }
}

}  // namespace
}  // namespace vyr_test::binder

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    using namespace vyr_test::binder;
    if (size < 1) return 0;
    switch (data[0] % 4) {
        case 0:
            FuzzWire(data + 1, size - 1);
            break;
        case 1:
            FuzzConnection(data + 1, size - 1);
            break;
        case 2:
            FuzzTransact(data + 1, size - 1);
            break;
        default:
            FuzzReads(data + 1, size - 1);
            break;
    }
    return 0;
}
