// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// What a SensorClient shares with the binder threads that report to it (events, the service's
// death, registrations): they hold it weakly or only while the client waits for them, so none
// of them outlives it.

#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>
#include <android/binder_manager.h>

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "vyr/event_sink.h"
#include "vyr/sensor_client.h"

namespace vyr {

class SensorClient::Core : public std::enable_shared_from_this<SensorClient::Core> {
  public:
    Core(SensorSettings settings, SensorClientListener* listener, ReattachPolicy policy);
    ~Core();
    Core(const Core&) = delete;
    Core& operator=(const Core&) = delete;

    int32_t Start(std::shared_ptr<aidl::android::vyr::IVYRService> service) EXCLUDES(mutex_);
    void Stop() EXCLUDES(mutex_);
    int32_t Poll(aidl::android::vyr::Event* event) EXCLUDES(mutex_);
    int32_t handle() const EXCLUDES(mutex_);
    State state() const EXCLUDES(mutex_);

  private:
    // How one attach went.
    struct Attempt {
        enum Kind { kOk, kDied, kRefused, kFailed };
        Attempt(Kind k, int32_t r = 0, std::string w = "")
            : kind(k), result(r), what(std::move(w)) {}
        Kind kind;
        int32_t result;
        // The call that failed.
        std::string what;
    };
    // The cookie of one death link: freed by the runtime's report that the link is gone.
    struct DeathCookie {
        std::weak_ptr<Core> core;
        AIBinder* binder;
    };

    // Links to the service's death, opens a handle and applies every setting.
    Attempt Attach(const std::shared_ptr<aidl::android::vyr::IVYRService>& service) EXCLUDES(mutex_);
    // Disables and closes what is open in the service and removes the death link.
    void Release() EXCLUDES(mutex_);
    // The re-attach thread: waits for the service's death, then for a new instance.
    void Supervise() EXCLUDES(mutex_);
    // Attaches to the next instance that registers; false if the client gave up or stops.
    bool Reattach(int32_t old_handle, const ndk::SpAIBinder& dead) EXCLUDES(mutex_);
    // Enable, or EnableOnSample when the settings and the service allow it.
    ndk::ScopedAStatus EnableHandle(aidl::android::vyr::IVYRService& service, int32_t handle,
                                    int32_t* result);
    void GiveUp(const std::string& reason) EXCLUDES(mutex_);
    void Deliver(const aidl::android::vyr::Event& event) EXCLUDES(mutex_);

    static void OnServiceDied(void* cookie);
    static void OnLinkGone(void* cookie);
    static void OnRegistered(const char* instance, AIBinder* registered, void* cookie);

    const SensorSettings settings_;
    SensorClientListener* const listener_;
    const ReattachPolicy policy_;
    // Reused for every instance: made once, never replaced while the client lives.
    std::shared_ptr<EventSink> sink_;
    // Deleted by Stop, once no link is left.
    AIBinder_DeathRecipient* recipient_;

    mutable std::mutex mutex_;
    std::condition_variable changed_;
    State state_ GUARDED_BY(mutex_) = State::kIdle;
    bool stopping_ GUARDED_BY(mutex_) = false;
    // The death notice of the instance in use came.
    bool lost_ GUARDED_BY(mutex_) = false;
    std::shared_ptr<aidl::android::vyr::IVYRService> service_ GUARDED_BY(mutex_);
    // The binder the death link is on, and its cookie, while linked.
    ndk::SpAIBinder linked_ GUARDED_BY(mutex_);
    DeathCookie* link_cookie_ GUARDED_BY(mutex_) = nullptr;
    int32_t handle_ GUARDED_BY(mutex_) = 0;
    bool enabled_ GUARDED_BY(mutex_) = false;
    // The latest binder a registration notice reported, not yet tried.
    ndk::SpAIBinder registered_ GUARDED_BY(mutex_);
    // Listener calls of OnEvent under way: Stop waits for them.
    int delivering_ GUARDED_BY(mutex_) = 0;
    std::chrono::steady_clock::time_point last_event_ GUARDED_BY(mutex_);
    std::thread thread_;
};

}  // namespace vyr
