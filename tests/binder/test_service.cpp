// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "test_service.h"

#include <android/binder_ibinder.h>
#include <android/binder_manager.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <string>

#include "test_descriptors.h"

namespace vyr_test::binder {

TestService::~TestService() {
    for (std::thread& sender : senders_) sender.join();
}

ndk::ScopedAStatus TestService::Open(int32_t mode, int32_t* result) {
    if (mode == kTorchCalleeLater) {
        std::lock_guard<std::mutex> lock(mutex_);
        // Late enough that the caller has read this reply and reads nothing any more.
        senders_.emplace_back([] {
            std::this_thread::sleep_for(std::chrono::milliseconds(100));
            std::shared_ptr<IVYRService> callee =
                IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_checkService(kCalleeName)));
            if (callee != nullptr) callee->SetTorchLightState(kCalleeTorch);
        });
        *result = 0;
        return ndk::ScopedAStatus::ok();
    }
    if (mode == kQueryTorchCaller) {
        *result = torch_caller_.load();
        return ndk::ScopedAStatus::ok();
    }
    *result = mode == kQueryTorch ? torch_state_.load() : mode * 10;
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::Close(int32_t handle) {
    std::shared_ptr<IEventCallback> callback = this->callback();
    if (handle <= 0 || callback == nullptr) return ndk::ScopedAStatus::ok();
    std::lock_guard<std::mutex> lock(mutex_);
    senders_.emplace_back([callback, handle] {
        for (int32_t i = 0; i < handle; ++i) {
            if (!callback->OnEvent(MakeEvent(i)).isOk()) return;
        }
    });
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::Enable(int32_t handle, int32_t period, int32_t* result) {
    *result = handle + period;
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::Disable(int32_t handle) {
    if (handle < 0) return ndk::ScopedAStatus::fromServiceSpecificErrorWithMessage(handle, "neg");
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::SetCallback(int32_t handle,
                                            const std::shared_ptr<IEventCallback>& callback,
                                            int32_t* result) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        callback_ = callback;
    }
    *result = callback == nullptr ? -22 : handle;
    // A positive handle asks for that many events to be delivered before returning: a call back
    // into the caller while it waits for this reply.
    for (int32_t i = 0; callback != nullptr && i < handle; ++i) {
        ndk::ScopedAStatus status = callback->OnEvent(MakeEvent(i));
        if (!status.isOk()) {
            *result = status.getStatus();
            break;
        }
    }
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::EnableLowPower(int32_t handle, bool enable, int32_t* result) {
    if (handle == kBlockForever) {
        // Stands for a service stuck in a call; only the caller's death ends the wait for it.
        for (;;) pause();
    }
    *result = enable ? 1 : 0;
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::PollOnce(int32_t handle, Event* event, int32_t* result) {
    *event = MakeEvent(handle);
    *result = static_cast<int32_t>(AIBinder_getCallingPid());
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::ConfigureParameters(int32_t /*handle*/,
                                                    const std::vector<int32_t>& params,
                                                    int32_t* result) {
    int32_t sum = 0;
    for (int32_t p : params) sum += p;
    *result = sum;
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::SetTorchLightState(int32_t state) {
    torch_caller_ = static_cast<int32_t>(AIBinder_getCallingPid());
    torch_state_ = state;
    return ndk::ScopedAStatus::ok();
}

// The round trips use version 1's methods only.
ndk::ScopedAStatus TestService::EnableOnSample(int32_t, int32_t, int32_t, int32_t* result) {
    *result = -ENOSYS;
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus TestService::Flush(int32_t, int32_t* result) {
    *result = -ENOSYS;
    return ndk::ScopedAStatus::ok();
}

std::string TestService::RingText(int32_t handle, int32_t period) {
    return "ring " + std::to_string(handle) + " every " + std::to_string(period) + " ms\n";
}

ndk::ScopedAStatus TestService::EnableRing(int32_t handle, int32_t period,
                                           ndk::ScopedFileDescriptor* ring, int32_t* result) {
    if (handle < 0) {
        *result = -ENOSYS;
        return ndk::ScopedAStatus::ok();
    }
    *ring = MakeTextFile(kRingName, RingText(handle, period));
    *result = ring->get() < 0 ? -errno : 0;
    return ndk::ScopedAStatus::ok();
}

std::shared_ptr<IEventCallback> TestService::callback() {
    std::lock_guard<std::mutex> lock(mutex_);
    return callback_;
}

ndk::ScopedAStatus RecordingCallback::OnEvent(const Event& event) {
    std::lock_guard<std::mutex> lock(mutex_);
    events_.push_back(event);
    cv_.notify_all();
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnEventBatch(const std::vector<Event>& events) {
    std::lock_guard<std::mutex> lock(mutex_);
    events_.insert(events_.end(), events.begin(), events.end());
    cv_.notify_all();
    return ndk::ScopedAStatus::ok();
}

ndk::ScopedAStatus RecordingCallback::OnFlushComplete(int32_t) {
    return ndk::ScopedAStatus::ok();
}

bool RecordingCallback::WaitForEvents(size_t count) {
    std::unique_lock<std::mutex> lock(mutex_);
    return cv_.wait_for(lock, std::chrono::seconds(10), [&] { return events_.size() >= count; });
}

std::vector<Event> RecordingCallback::events() {
    std::lock_guard<std::mutex> lock(mutex_);
    return events_;
}

Event MakeEvent(int32_t handle) {
    Event event;
    event.status = static_cast<int8_t>(handle);
    event.timestamp = 1000000000000LL + handle;
    event.value0 = 1.5f * static_cast<float>(handle);
    event.value1 = -2.25f;
    event.data.assign(static_cast<size_t>(handle % 7), 0.5f);
    return event;
}

binder_status_t TestService::dump(int fd, const char** args, uint32_t num_args) {
    std::string line = "dump:";
    for (uint32_t i = 0; i < num_args; ++i) line += std::string(" ") + args[i];
    line += "\n";
    if (write(fd, line.data(), line.size()) != static_cast<ssize_t>(line.size())) {
        return -errno;
    }
    const std::string mode = num_args > 0 ? args[0] : "";
    if (mode == "big") {
        const std::string chunk(64 * 1024, 'x');
        for (int i = 0; i < 64; ++i) {
            if (write(fd, chunk.data(), chunk.size()) < 0) return -errno;
        }
    } else if (mode == "slow") {
        for (int i = 0; i < 1000; ++i) {
            if (write(fd, "tick\n", 5) < 0) return -errno;
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
    }
    return STATUS_OK;
}

}  // namespace vyr_test::binder
