// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// A client built from the frozen version 1 of the interface, as the first clients were: it knows
// no version 2 method, and its Event has no boot time.
//
//   v1_client parts      runs version 1's calls in turn and prints each one's result, then "done"
//   v1_client callback   opens a range handle with a callback, prints "handle N", then "event T"
//                        for each event until its stdin closes; then disables and closes
//
// It reaches the service of VYR_BINDER_DIR. Exits 1 if the service cannot be found.

#include <aidl/android/vyr/BnEventCallback.h>
#include <aidl/android/vyr/IVYRService.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <iostream>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace vyr_test::datapath {
namespace {

using aidl::android::vyr::BnEventCallback;
using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;

constexpr int32_t kRange = 3;
constexpr auto kEventWait = std::chrono::seconds(10);

class Callback : public BnEventCallback {
  public:
    explicit Callback(bool print) : print_(print) {}

    ndk::ScopedAStatus OnEvent(const Event& event) override {
        std::lock_guard<std::mutex> lock(mutex_);
        events_.push_back(event);
        if (print_) {
            std::cout << "event " << event.timestamp << std::endl;
        }
        changed_.notify_all();
        return ndk::ScopedAStatus::ok();
    }

    bool WaitForEvents(size_t count) {
        std::unique_lock<std::mutex> lock(mutex_);
        return changed_.wait_for(lock, kEventWait, [&] { return events_.size() >= count; });
    }

    std::vector<Event> Events() {
        std::lock_guard<std::mutex> lock(mutex_);
        return events_;
    }

  private:
    const bool print_;
    std::mutex mutex_;
    std::condition_variable changed_;
    std::vector<Event> events_;
};

void Print(const std::string& call, int32_t result) {
    std::cout << call << " " << result << std::endl;
}

// A range event's data: 10 header values, then 11 per zone; the zone count is the ninth.
bool RangeShapeHolds(const Event& event) {
    if (event.data.size() < 10) return false;
    const size_t zones = static_cast<size_t>(event.data[8]);
    return event.data.size() == 10 + 11 * zones;
}

int Parts(IVYRService& service) {
    int32_t result = 0;
    service.Open(7, &result);
    Print("Open 7", result);
    int32_t handle = 0;
    service.Open(kRange, &handle);
    std::cout << "Open 3 " << (handle > 0 ? "handle" : std::to_string(handle)) << std::endl;

    auto callback = ndk::SharedRefBase::make<Callback>(false);
    service.SetCallback(handle, callback, &result);
    Print("SetCallback", result);
    service.Enable(handle, 50, &result);
    Print("Enable", result);
    service.Enable(handle, 50, &result);
    Print("Enable again", result);
    service.SetCallback(handle, callback, &result);
    Print("SetCallback enabled", result);
    service.EnableLowPower(handle, true, &result);
    Print("EnableLowPower", result);
    service.ConfigureParameters(handle, std::vector<int32_t>(10, 0), &result);
    Print("ConfigureParameters 10", result);

    const bool arrived = callback->WaitForEvents(3);
    std::cout << "events " << (arrived ? "arrived" : "missing") << std::endl;
    const std::vector<Event> events = callback->Events();
    bool shaped = true;
    bool ordered = true;
    for (size_t i = 0; i < events.size(); ++i) {
        shaped = shaped && RangeShapeHolds(events[i]);
        ordered = ordered && (i == 0 || events[i].timestamp > events[i - 1].timestamp);
    }
    std::cout << "events shaped " << shaped << " ordered " << ordered << std::endl;

    service.Disable(handle);
    service.Close(handle);
    service.Enable(handle, 50, &result);
    Print("Enable closed", result);
    Event event;
    service.PollOnce(handle, &event, &result);
    Print("PollOnce closed", result);
    service.SetCallback(handle, callback, &result);
    Print("SetCallback closed", result);
    service.EnableLowPower(handle, true, &result);
    Print("EnableLowPower closed", result);
    service.ConfigureParameters(handle, std::vector<int32_t>(11, 0), &result);
    Print("ConfigureParameters closed", result);
    std::cout << "done" << std::endl;
    return 0;
}

int CallbackClient(IVYRService& service) {
    int32_t handle = 0;
    service.Open(kRange, &handle);
    auto callback = ndk::SharedRefBase::make<Callback>(true);
    int32_t result = 0;
    service.SetCallback(handle, callback, &result);
    std::cout << "handle " << handle << " " << result << std::endl;
    std::string line;
    while (std::getline(std::cin, line)) {
    }
    service.Disable(handle);
    service.Close(handle);
    return 0;
}

}  // namespace
}  // namespace vyr_test::datapath

int main(int argc, char** argv) {
    using namespace vyr_test::datapath;
    const std::string mode = argc > 1 ? argv[1] : "";
    ABinderProcess_startThreadPool();
    std::shared_ptr<IVYRService> service;
    for (int attempt = 0; attempt < 300 && service == nullptr; ++attempt) {
        service =
            IVYRService::fromBinder(ndk::SpAIBinder(AServiceManager_checkService("vyrservice")));
        if (service == nullptr) std::this_thread::sleep_for(std::chrono::milliseconds(100));
    }
    if (service == nullptr) {
        std::cerr << "vyrservice not found" << std::endl;
        return 1;
    }
    if (mode == "parts") return Parts(*service);
    if (mode == "callback") return CallbackClient(*service);
    std::cerr << "usage: v1_client parts|callback" << std::endl;
    return 2;
}
