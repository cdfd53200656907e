// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "sensor_client_core.h"

#include <android/binder_process.h>
#include <pthread.h>

#include <algorithm>
#include <cerrno>

namespace vyr {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::steady_clock;

SensorClient::Core::Core(SensorSettings settings, SensorClientListener* listener,
                         ReattachPolicy policy)
    : settings_(std::move(settings)),
      listener_(listener),
      policy_(policy),
      recipient_(AIBinder_DeathRecipient_new(&Core::OnServiceDied)) {
    AIBinder_DeathRecipient_setOnUnlinked(recipient_, &Core::OnLinkGone);
}

SensorClient::Core::~Core() {
    // Stop has deleted it, unless the client never ran.
    if (recipient_ != nullptr) AIBinder_DeathRecipient_delete(recipient_);
}

int32_t SensorClient::Core::Start(std::shared_ptr<IVYRService> service) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (state_ != State::kIdle) return -EALREADY;
        last_event_ = steady_clock::now();
    }
    if (service == nullptr) return kNotAttached;
    if (!ABinderProcess_isThreadPoolStarted()) return kNoThreadPool;
    if (sink_ == nullptr) {
        sink_ = ndk::SharedRefBase::make<EventSink>([weak = weak_from_this()](const Event& event) {
            if (std::shared_ptr<Core> core = weak.lock()) core->Deliver(event);
        });
    }
    const Attempt attempt = Attach(service);
    if (attempt.kind != Attempt::kOk) {
        Release();
        std::lock_guard<std::mutex> lock(mutex_);
        state_ = State::kIdle;
        return attempt.kind == Attempt::kDied ? kNotAttached : attempt.result;
    }
    thread_ = std::thread(&Core::Supervise, this);
    return 0;
}

void SensorClient::Core::Stop() {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (state_ == State::kStopped) return;
        stopping_ = true;
    }
    changed_.notify_all();
    if (thread_.joinable()) thread_.join();
    {
        std::unique_lock<std::mutex> lock(mutex_);
        android::base::ScopedLockAssertion locked(mutex_);
        changed_.wait(lock, [this]() REQUIRES(mutex_) { return delivering_ == 0; });
    }
    Release();
    // No link is left; no notice can reach this client any more.
    AIBinder_DeathRecipient_delete(recipient_);
    recipient_ = nullptr;
    std::lock_guard<std::mutex> lock(mutex_);
    state_ = State::kStopped;
}

int32_t SensorClient::Core::Poll(Event* event) {
    std::shared_ptr<IVYRService> service;
    int32_t handle = 0;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (state_ != State::kAttached) return kNotAttached;
        service = service_;
        handle = handle_;
    }
    int32_t result = 0;
    // A failed call means the service is dying: its death notice starts the re-attach.
    if (!service->PollOnce(handle, event, &result).isOk()) return kNotAttached;
    if (result == 0) {
        std::lock_guard<std::mutex> lock(mutex_);
        last_event_ = steady_clock::now();
    }
    return result;
}

int32_t SensorClient::Core::handle() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return handle_;
}

SensorClient::State SensorClient::Core::state() const {
    std::lock_guard<std::mutex> lock(mutex_);
    return state_;
}

SensorClient::Core::Attempt SensorClient::Core::Attach(const std::shared_ptr<IVYRService>& service) {
    ndk::SpAIBinder binder = service->asBinder();
    auto* cookie = new DeathCookie{weak_from_this(), binder.get()};
    {
        std::lock_guard<std::mutex> lock(mutex_);
        service_ = service;
        linked_ = binder;
        link_cookie_ = cookie;
    }
    // Linked first: a death at any later step is noticed. A link that fails has already been
    // reported unlinked, which freed the cookie.
    if (AIBinder_linkToDeath(binder.get(), recipient_, cookie) != STATUS_OK) {
        std::lock_guard<std::mutex> lock(mutex_);
        linked_ = ndk::SpAIBinder();
        link_cookie_ = nullptr;
        return {Attempt::kDied};
    }
    int32_t result = 0;
    if (!service->Open(settings_.mode, &result).isOk()) return {Attempt::kDied};
    if (result < 0) {
        const bool retry = result == -1 || result == -ENODEV;
        return {retry ? Attempt::kRefused : Attempt::kFailed, result, "open"};
    }
    const int32_t handle = result;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        handle_ = handle;
    }
    if (settings_.use_callback) {
        if (!service->SetCallback(handle, sink_, &result).isOk()) return {Attempt::kDied};
        if (result != 0) return {Attempt::kFailed, result, "callback"};
    }
    if (settings_.low_power) {
        if (!service->EnableLowPower(handle, *settings_.low_power, &result).isOk()) {
            return {Attempt::kDied};
        }
        if (result != 0) listener_->OnSettingRefused("low power", result);
    }
    if (!settings_.control_values.empty()) {
        if (!service->ConfigureParameters(handle, settings_.control_values, &result).isOk()) {
            return {Attempt::kDied};
        }
        if (result != 0) listener_->OnSettingRefused("control values", result);
    }
    if (!EnableHandle(*service, handle, &result).isOk()) return {Attempt::kDied};
    if (result != 0) return {Attempt::kFailed, result, "enable"};
    std::lock_guard<std::mutex> lock(mutex_);
    enabled_ = true;
    state_ = State::kAttached;
    return {Attempt::kOk};
}

void SensorClient::Core::Release() {
    std::shared_ptr<IVYRService> service;
    ndk::SpAIBinder linked;
    DeathCookie* cookie = nullptr;
    int32_t handle = 0;
    bool enabled = false;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        service.swap(service_);
        std::swap(linked, linked_);
        std::swap(cookie, link_cookie_);
        std::swap(handle, handle_);
        std::swap(enabled, enabled_);
        // A notice of this instance that came meanwhile is no loss any more.
        lost_ = false;
    }
    // Without the lock: the runtime may report the unlink (OnLinkGone frees the cookie) or run a
    // notice that takes it.
    if (linked.get() != nullptr) AIBinder_unlinkToDeath(linked.get(), recipient_, cookie);
    if (service == nullptr || handle == 0 || !AIBinder_isAlive(service->asBinder().get())) return;
    if (enabled) service->Disable(handle);
    service->Close(handle);
}

void SensorClient::Core::Supervise() {
    // Named so that a thread left behind is easy to tell.
    pthread_setname_np(pthread_self(), "vyrclient");
    while (true) {
        int32_t old_handle = 0;
        ndk::SpAIBinder dead;
        {
            std::unique_lock<std::mutex> lock(mutex_);
            android::base::ScopedLockAssertion locked(mutex_);
            changed_.wait(lock, [this]() REQUIRES(mutex_) { return stopping_ || lost_; });
            if (stopping_) return;
            old_handle = handle_;
            dead = linked_;
            state_ = policy_.reattach ? State::kReattaching : State::kLost;
        }
        Release();
        listener_->OnServiceLost(old_handle);
        if (!policy_.reattach || !Reattach(old_handle, dead)) return;
    }
}

bool SensorClient::Core::Reattach(int32_t old_handle, const ndk::SpAIBinder& dead) {
    AServiceManager_NotificationRegistration* registration =
        AServiceManager_registerForServiceNotifications(policy_.service_name.c_str(),
                                                        &Core::OnRegistered, this);
    if (registration == nullptr) {
        GiveUp("cannot wait for \"" + policy_.service_name + "\" to be registered");
        return false;
    }
    int refusals = 0;
    std::chrono::milliseconds delay = policy_.first_delay;
    bool attached = false;
    while (true) {
        ndk::SpAIBinder binder;
        {
            std::unique_lock<std::mutex> lock(mutex_);
            android::base::ScopedLockAssertion locked(mutex_);
            changed_.wait(lock, [this, &dead]() REQUIRES(mutex_) {
                return stopping_ ||
                       (registered_.get() != nullptr && registered_.get() != dead.get());
            });
            if (stopping_) break;
            std::swap(binder, registered_);
        }
        if (!AIBinder_isAlive(binder.get())) continue;
        std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
        if (service == nullptr) {
            GiveUp("\"" + policy_.service_name + "\" does not implement " + IVYRService::descriptor);
            break;
        }
        const Attempt attempt = Attach(service);
        if (attempt.kind == Attempt::kOk) {
            attached = true;
            break;
        }
        Release();
        // Died again before it was attached: wait for its successor.
        if (attempt.kind == Attempt::kDied) continue;
        if (attempt.kind == Attempt::kFailed) {
            GiveUp(attempt.what + " -> " + std::to_string(attempt.result));
            break;
        }
        if (++refusals >= policy_.max_refusals) {
            GiveUp("open refused " + std::to_string(refusals) + " times, last with " +
                   std::to_string(attempt.result));
            break;
        }
        listener_->OnOpenRefused(attempt.result, refusals, delay);
        {
            std::unique_lock<std::mutex> lock(mutex_);
            android::base::ScopedLockAssertion locked(mutex_);
            if (changed_.wait_for(lock, delay, [this]() REQUIRES(mutex_) { return stopping_; })) {
                break;
            }
            // The same instance again, unless a newer one has registered meanwhile.
            if (registered_.get() == nullptr) registered_ = binder;
        }
        delay = std::min(delay * 2, policy_.max_delay);
    }
    // Deleted outside the lock: it waits for a notice that may be taking the lock.
    AServiceManager_NotificationRegistration_delete(registration);
    int32_t new_handle = 0;
    std::chrono::milliseconds since_last_event{0};
    {
        std::lock_guard<std::mutex> lock(mutex_);
        registered_ = ndk::SpAIBinder();
        new_handle = handle_;
        since_last_event =
            std::chrono::duration_cast<std::chrono::milliseconds>(steady_clock::now() - last_event_);
    }
    if (attached) listener_->OnResumed(old_handle, new_handle, since_last_event);
    return attached;
}

ndk::ScopedAStatus SensorClient::Core::EnableHandle(IVYRService& service, int32_t handle,
                                                    int32_t* result) {
    if (settings_.use_callback && settings_.max_interface_version >= 2) {
        int32_t version = 1;
        // A service that cannot say is of version 1; a dead one fails the Enable below as well.
        if (!service.getInterfaceVersion(&version).isOk()) version = 1;
        if (version >= 2) {
            return service.EnableOnSample(handle, settings_.period_ms, /*maxReportLatency=*/0,
                                          result);
        }
    }
    return service.Enable(handle, settings_.period_ms, result);
}

void SensorClient::Core::GiveUp(const std::string& reason) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        state_ = State::kGaveUp;
    }
    listener_->OnGaveUp(reason);
}

void SensorClient::Core::Deliver(const Event& event) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (stopping_) return;
        ++delivering_;
        last_event_ = steady_clock::now();
    }
    listener_->OnEvent(event);
    {
        std::lock_guard<std::mutex> lock(mutex_);
        --delivering_;
    }
    changed_.notify_all();
}

void SensorClient::Core::OnServiceDied(void* cookie) {
    const auto* death = static_cast<const DeathCookie*>(cookie);
    std::shared_ptr<Core> core = death->core.lock();
    if (core == nullptr) return;
    {
        std::lock_guard<std::mutex> lock(core->mutex_);
        // A notice of an instance already given up is no news.
        if (core->linked_.get() != death->binder) return;
        core->lost_ = true;
    }
    core->changed_.notify_all();
}

void SensorClient::Core::OnLinkGone(void* cookie) {
    delete static_cast<DeathCookie*>(cookie);
}

void SensorClient::Core::OnRegistered(const char* /*instance*/, AIBinder* registered, void* cookie) {
    auto* core = static_cast<Core*>(cookie);
    {
        std::lock_guard<std::mutex> lock(core->mutex_);
        // Each notice hands over a reference of its own.
        core->registered_.set(registered);
    }
    core->changed_.notify_all();
}

}  // namespace vyr
