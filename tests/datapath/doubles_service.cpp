// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The service on the sensor test doubles, in a process of its own, and a client of it: what the
// cross-process suite starts beside itself, on the host and on a device alike.
//
//   vyr_doubles_service serve <name>   registers a VYRService (range sensor only, no start-up
//                                      delay) as <name>, prints "registered", serves for good;
//                                      its range frames are numbered by their time_ms
//   vyr_doubles_service client <name>  opens a range handle with a callback, enables it at
//                                      20 ms, prints "handle <h>" and waits to be killed
//   vyr_doubles_service shared <name> first|second
//                                      opens two range handles and sets one callback object on
//                                      both, the first handle's link made first or second;
//                                      enables both at 20 ms, prints "handles <a> <b>" and waits
//                                      to be killed
//   vyr_doubles_service stuck <name>   the same enabled on sample (version 2), with a callback
//                                      that never returns: prints "handle <h>" once the service
//                                      is inside it, "disabling" as another thread calls
//                                      Disable, and waits to be killed
//   vyr_doubles_service stuck-batch <name>
//                                      enables on sample at 1 ms with the longest latency, with
//                                      that callback: it never returns from its first batch;
//                                      prints "handle <h>" once inside it and waits to be killed
//   vyr_doubles_service batch <name>   the same with a callback that takes each batch at once
//   vyr_doubles_service ring <name>    opens a range handle, enables it on the sample ring at
//                                      1 ms, maps the ring, prints "handle <h>" and waits to be
//                                      killed

#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "recording_callback.h"
#include "sensor_doubles.h"
#include "service_config.h"
#include "vyrservice.h"

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::IVYRService;
using android::vyr::binder::ServiceConfig;
using android::vyr::binder::VYRService;

constexpr int32_t kRange = 3;
constexpr uint32_t kNumberedFrames = 60000;

int Serve(const char* name) {
    // Valid one-zone frames numbered 1, 2, ... by their sensor time (a minute's worth at 1 ms),
    // so that a client can tell a lost or repeated sample; the last one after that.
    MultiRangingData frame{};
    frame.zone_count = 1;
    frame.zones[0].distance_mm = 500;
    frame.valid = 1;
    for (uint32_t time_ms = 1; time_ms <= kNumberedFrames; ++time_ms) {
        frame.time_ms = time_ms;
        sensor_doubles::QueueRangeData(frame);
    }
    sensor_doubles::SetRangeData(frame);
    ServiceConfig config;
    // The properties' defaults: the range sensor only, and so no display monitor.
    config.get_bool_property = [](const char* /*key*/, bool default_value) { return default_value; };
    config.startup_delay = std::chrono::milliseconds(0);
    auto service = ndk::SharedRefBase::make<VYRService>(config);
    ABinderProcess_startThreadPool();
    if (AServiceManager_addService(service->asBinder().get(), name) != EX_NONE) return 2;
    printf("registered\n");
    fflush(stdout);
    ABinderProcess_joinThreadPool();
    return 1;
}

// The service registered as `name`, with this process's binder pool started.
std::shared_ptr<IVYRService> Connect(const char* name) {
    ABinderProcess_startThreadPool();
    return IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_waitForService(name)));
}

// A range handle of `service` with `callback` set: 0 with `*handle` set, or the exit status of the
// step that failed.
int OpenWithCallback(IVYRService& service,
                     const std::shared_ptr<aidl::android::vyr::IEventCallback>& callback,
                     int32_t* handle) {
    int32_t result = 0;
    if (!service.Open(kRange, handle).isOk() || *handle <= 0) return 3;
    if (!service.SetCallback(*handle, callback, &result).isOk() || result != 0) return 4;
    return 0;
}

int Client(const char* name) {
    std::shared_ptr<IVYRService> service = Connect(name);
    if (service == nullptr) return 2;
    int32_t handle = 0;
    int32_t result = 0;
    auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
    if (int failed = OpenWithCallback(*service, callback, &handle)) return failed;
    if (!service->Enable(handle, 20, &result).isOk() || result != 0) return 5;
    printf("handle %d\n", handle);
    fflush(stdout);
    for (;;) pause();
}

int Ring(const char* name) {
    std::shared_ptr<IVYRService> service = Connect(name);
    if (service == nullptr) return 2;
    int32_t handle = 0;
    int32_t result = 0;
    if (!service->Open(kRange, &handle).isOk() || handle <= 0) return 3;
    ndk::ScopedFileDescriptor ring;
    if (!service->EnableRing(handle, 1, &ring, &result).isOk() || result != 0) return 5;
    struct stat st {};
    if (fstat(ring.get(), &st) != 0) return 6;
    // Held mapped until the process is killed, as a camera pipeline holds it.
    if (mmap(nullptr, static_cast<size_t>(st.st_size), PROT_READ, MAP_SHARED, ring.get(), 0) ==
        MAP_FAILED) {
        return 7;
    }
    printf("handle %d\n", handle);
    fflush(stdout);
    for (;;) pause();
}

int Shared(const char* name, bool first_linked_first) {
    std::shared_ptr<IVYRService> service = Connect(name);
    if (service == nullptr) return 2;
    int32_t handles[2] = {0, 0};
    int32_t result = 0;
    auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
    for (int32_t& handle : handles) {
        if (!service->Open(kRange, &handle).isOk() || handle <= 0) return 3;
    }
    const int32_t order[2] = {first_linked_first ? handles[0] : handles[1],
                              first_linked_first ? handles[1] : handles[0]};
    for (int32_t handle : order) {
        if (!service->SetCallback(handle, callback, &result).isOk() || result != 0) return 4;
    }
    for (int32_t handle : handles) {
        if (!service->Enable(handle, 20, &result).isOk() || result != 0) return 5;
    }
    printf("handles %d %d\n", handles[0], handles[1]);
    fflush(stdout);
    for (;;) pause();
}

// An on-sample callback that never answers.
class StuckCallback : public aidl::android::vyr::BnEventCallback {
  public:
    ndk::ScopedAStatus OnEvent(const aidl::android::vyr::Event& /*event*/) override {
        Hang();
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnEventBatch(const std::vector<aidl::android::vyr::Event>&) override {
        Hang();
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus OnFlushComplete(int32_t /*handle*/) override {
        Hang();
        return ndk::ScopedAStatus::ok();
    }
    void WaitUntilCalled() {
        std::unique_lock<std::mutex> lock(mutex_);
        changed_.wait(lock, [this] { return called_; });
    }

  private:
    void Hang() {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            called_ = true;
        }
        changed_.notify_all();
        for (;;) pause();
    }
    std::mutex mutex_;
    std::condition_variable changed_;
    bool called_ = false;
};

// A client at 1 ms with the longest latency, its batches taken by `callback`; `called` returns
// once the first has come.
template <typename Callback>
int Batches(const char* name, const std::shared_ptr<Callback>& callback,
            const std::function<void()>& called) {
    std::shared_ptr<IVYRService> service = Connect(name);
    if (service == nullptr) return 2;
    int32_t handle = 0;
    int32_t result = 0;
    if (int failed = OpenWithCallback(*service, callback, &handle)) return failed;
    if (!service->EnableOnSample(handle, 1, 60000, &result).isOk() || result != 0) return 5;
    called();
    printf("handle %d\n", handle);
    fflush(stdout);
    for (;;) pause();
}

int Stuck(const char* name) {
    std::shared_ptr<IVYRService> service = Connect(name);
    if (service == nullptr) return 2;
    int32_t handle = 0;
    int32_t result = 0;
    auto callback = ndk::SharedRefBase::make<StuckCallback>();
    if (int failed = OpenWithCallback(*service, callback, &handle)) return failed;
    if (!service->EnableOnSample(handle, 20, 0, &result).isOk() || result != 0) return 5;
    callback->WaitUntilCalled();
    printf("handle %d\n", handle);
    fflush(stdout);
    std::thread disabler([service, handle] {
        printf("disabling\n");
        fflush(stdout);
        service->Disable(handle);
    });
    disabler.detach();
    for (;;) pause();
}

}  // namespace
}  // namespace vyr_test::datapath

int main(int argc, char** argv) {
    using namespace vyr_test::datapath;
    if (argc == 3 && strcmp(argv[1], "serve") == 0) return Serve(argv[2]);
    if (argc == 3 && strcmp(argv[1], "client") == 0) return Client(argv[2]);
    if (argc == 3 && strcmp(argv[1], "stuck") == 0) return Stuck(argv[2]);
    if (argc == 3 && strcmp(argv[1], "ring") == 0) return Ring(argv[2]);
    if (argc == 3 && strcmp(argv[1], "stuck-batch") == 0) {
        auto callback = ndk::SharedRefBase::make<StuckCallback>();
        return Batches(argv[2], callback, [callback] { callback->WaitUntilCalled(); });
    }
    if (argc == 3 && strcmp(argv[1], "batch") == 0) {
        auto callback = ndk::SharedRefBase::make<vyr_test::RecordingCallback>();
        return Batches(argv[2], callback, [callback] {
            callback->WaitForBatches(1, std::chrono::milliseconds(60000));
        });
    }
    if (argc == 4 && strcmp(argv[1], "shared") == 0) {
        return Shared(argv[2], strcmp(argv[3], "first") == 0);
    }
    fprintf(stderr,
            "usage: %s serve|client|stuck|stuck-batch|batch|ring <name> | shared <name> "
            "first|second\n",
            argv[0]);
    return 64;
}
