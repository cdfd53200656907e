// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A stand-in for vyrservice that the client library's tests start, kill and start again in
// milliseconds (the real one takes 4 s to register). It prints one line per call on stdout:
//   "<Method> <arguments> -> <result>"
// and pushes an event to a client with a callback every period while it is enabled.
// Built twice: vyr_fake_service of today's interface, where EnableOnSample enables as Enable
// does, and vyr_fake_service_v1 from the frozen version 1 (VYR_FAKE_SERVICE_V1), which knows
// only version 1's methods and Event.
//
//   vyr_fake_service [--first-handle H] [--refuse N] [--absent]
//     --first-handle H  handles are H, H+1, ... (default 1)
//     --refuse N        the first N Opens answer -1 (table full)
//     --absent          every Open answers -19 (sensor absent)

#include <aidl/android/vyr/BnVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

namespace vyr_test::client {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

void Say(const std::string& line) {
    printf("%s\n", line.c_str());
    fflush(stdout);
}

// Events for one enabled client with a callback, on a thread of its own.
class Pusher {
  public:
    Pusher(std::shared_ptr<IEventCallback> callback, int32_t handle, int32_t period_ms)
        : thread_([this, callback, handle, period_ms] {
              std::unique_lock<std::mutex> lock(mutex_);
              for (int64_t n = 1; !stop_; ++n) {
                  if (cv_.wait_for(lock, std::chrono::milliseconds(period_ms),
                                   [this] { return stop_; })) {
                      break;
                  }
                  Event event{};
                  event.timestamp = n;
#ifndef VYR_FAKE_SERVICE_V1
                  event.boottime = n * 1000000;
#endif
                  event.value0 = static_cast<float>(handle);
                  lock.unlock();
                  callback->OnEvent(event);
                  lock.lock();
              }
          }) {
    }
    ~Pusher() {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            stop_ = true;
        }
        cv_.notify_all();
        thread_.join();
    }

  private:
    std::mutex mutex_;
    std::condition_variable cv_;
    bool stop_ = false;
    std::thread thread_;
};

class FakeService : public aidl::android::vyr::BnVYRService {
  public:
    FakeService(int32_t first_handle, int refusals, bool absent)
        : next_handle_(first_handle), refusals_(refusals), absent_(absent) {}

    ndk::ScopedAStatus Open(int32_t mode, int32_t* result) override {
        std::lock_guard<std::mutex> lock(mutex_);
        if (absent_) {
            *result = -19;
        } else if (refusals_ > 0) {
            --refusals_;
            *result = -1;
        } else {
            *result = next_handle_++;
            clients_[*result];
        }
        Say("Open " + std::to_string(mode) + " -> " + std::to_string(*result));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Close(int32_t handle) override {
        std::lock_guard<std::mutex> lock(mutex_);
        clients_.erase(handle);
        Say("Close " + std::to_string(handle));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Enable(int32_t handle, int32_t period, int32_t* result) override {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = clients_.find(handle);
        *result = it == clients_.end() ? -38 : 0;
        if (it != clients_.end() && it->second.callback) {
            it->second.pusher = std::make_unique<Pusher>(it->second.callback, handle, period);
        }
        Say("Enable " + std::to_string(handle) + " " + std::to_string(period) + " -> " +
            std::to_string(*result));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Disable(int32_t handle) override {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = clients_.find(handle);
        if (it != clients_.end()) it->second.pusher.reset();
        Say("Disable " + std::to_string(handle));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus SetCallback(int32_t handle, const std::shared_ptr<IEventCallback>& callback,
                                   int32_t* result) override {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = clients_.find(handle);
        *result = it == clients_.end() ? -22 : 0;
        if (it != clients_.end()) it->second.callback = callback;
        Say("SetCallback " + std::to_string(handle) + " -> " + std::to_string(*result));
        return ndk::ScopedAStatus::ok();
    }
#ifndef VYR_FAKE_SERVICE_V1
    ndk::ScopedAStatus EnableOnSample(int32_t handle, int32_t period, int32_t latency,
                                      int32_t* result) override {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = clients_.find(handle);
        *result = it == clients_.end() ? -38 : 0;
        if (it != clients_.end() && it->second.callback) {
            it->second.pusher = std::make_unique<Pusher>(it->second.callback, handle, period);
        }
        Say("EnableOnSample " + std::to_string(handle) + " " + std::to_string(period) + " " +
            std::to_string(latency) + " -> " + std::to_string(*result));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus Flush(int32_t handle, int32_t* result) override {
        *result = 0;
        Say("Flush " + std::to_string(handle) + " -> 0");
        return ndk::ScopedAStatus::ok();
    }
    // No ring here: answered as the service answers an unknown handle, with no descriptor.
    ndk::ScopedAStatus EnableRing(int32_t handle, int32_t period, ndk::ScopedFileDescriptor*,
                                  int32_t* result) override {
        *result = -38;
        Say("EnableRing " + std::to_string(handle) + " " + std::to_string(period) + " -> -38");
        return ndk::ScopedAStatus::ok();
    }
#endif
    ndk::ScopedAStatus EnableLowPower(int32_t handle, bool enable, int32_t* result) override {
        // As the service does for range handles.
        *result = -22;
        Say("EnableLowPower " + std::to_string(handle) + " " + std::to_string(enable) + " -> " +
            std::to_string(*result));
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus PollOnce(int32_t handle, Event* event, int32_t* result) override {
        event->timestamp = ++polls_;
        *result = 0;
        Say("PollOnce " + std::to_string(handle) + " -> 0");
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus ConfigureParameters(int32_t handle, const std::vector<int32_t>& params,
                                           int32_t* result) override {
        std::string values;
        for (int32_t value : params) values += " " + std::to_string(value);
        *result = 0;
        Say("ConfigureParameters " + std::to_string(handle) + values + " -> 0");
        return ndk::ScopedAStatus::ok();
    }
    ndk::ScopedAStatus SetTorchLightState(int32_t state) override {
        Say("SetTorchLightState " + std::to_string(state));
        return ndk::ScopedAStatus::ok();
    }

  private:
    struct Client {
        std::shared_ptr<IEventCallback> callback;
        std::unique_ptr<Pusher> pusher;
    };
    std::mutex mutex_;
    int32_t next_handle_;
    int refusals_;
    const bool absent_;
    std::atomic<int64_t> polls_{0};
    std::map<int32_t, Client> clients_;
};

}  // namespace
}  // namespace vyr_test::client

int main(int argc, char** argv) {
    using namespace vyr_test::client;
    int32_t first_handle = 1;
    int refusals = 0;
    bool absent = false;
    for (int i = 1; i < argc; ++i) {
        if (strcmp(argv[i], "--first-handle") == 0 && i + 1 < argc) {
            first_handle = atoi(argv[++i]);
        } else if (strcmp(argv[i], "--refuse") == 0 && i + 1 < argc) {
            refusals = atoi(argv[++i]);
        } else if (strcmp(argv[i], "--absent") == 0) {
            absent = true;
        } else {
            fprintf(stderr, "usage: %s [--first-handle H] [--refuse N] [--absent]\n", argv[0]);
            return 2;
        }
    }
    auto service = ndk::SharedRefBase::make<FakeService>(first_handle, refusals, absent);
    if (AServiceManager_addService(service->asBinder().get(), "vyrservice") != EX_NONE) return 1;
    Say("registered");
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
    return 1;
}
