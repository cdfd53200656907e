// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "service_notification.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "process_state.h"
#include "registry.h"

using vyr_binder::ProcessState;
using vyr_binder::Registry;

namespace {

// The registration whose notice this thread is running, if any.
thread_local const void* t_notice_of = nullptr;

}  // namespace

AServiceManager_NotificationRegistration::AServiceManager_NotificationRegistration(
    const char* instance, AServiceManager_onRegister callback, void* cookie, bool on_pool)
    : name_(instance), on_pool_(on_pool), notices_(std::make_shared<Notices>()) {
    notices_->instance = instance;
    std::lock_guard<std::mutex> lock(notices_->mutex);
    notices_->callback = callback;
    notices_->cookie = cookie;
}

AServiceManager_NotificationRegistration::~AServiceManager_NotificationRegistration() {
    if (t_notice_of == notices_.get()) {
        // The registration's lock is held by this very thread: a device deadlocks here.
        fprintf(stderr,
                "binder: AServiceManager_NotificationRegistration_delete of %s from its own "
                "notice deadlocks on a device\n",
                name_.c_str());
        abort();
    }
    if (thread_.joinable()) {
        const uint64_t one = 1;
        (void)!write(wake_fd_.get(), &one, sizeof(one));
        thread_.join();
    }
    // Waits for a notice that is running; queued ones find no callback.
    std::lock_guard<std::mutex> lock(notices_->mutex);
    notices_->callback = nullptr;
    notices_->cookie = nullptr;
}

bool AServiceManager_NotificationRegistration::Start() {
    std::string dir;
    if (!Registry::Dir(&dir)) return false;
    inotify_fd_.reset(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
    wake_fd_.reset(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    if (inotify_fd_.get() < 0 || wake_fd_.get() < 0) {
        fprintf(stderr, "binder: cannot watch for %s: %s\n", name_.c_str(), strerror(errno));
        return false;
    }
    // A registration renames the name's entry into place.
    if (inotify_add_watch(inotify_fd_.get(), dir.c_str(), IN_MOVED_TO | IN_CREATE) < 0) {
        fprintf(stderr, "binder: cannot watch registry %s: %s\n", dir.c_str(), strerror(errno));
        return false;
    }
    thread_ = std::thread(&AServiceManager_NotificationRegistration::Run, this);
    return true;
}

void AServiceManager_NotificationRegistration::Notify(ndk::SpAIBinder binder) {
    {
        std::lock_guard<std::mutex> lock(notices_->queue_mutex);
        notices_->queue.push_back(std::move(binder));
        if (notices_->draining) return;
        notices_->draining = true;
    }
    if (on_pool_) {
        ProcessState::Get().looper().Enqueue([notices = notices_] { notices->Drain(); });
    } else {
        notices_->Drain();
    }
}

void AServiceManager_NotificationRegistration::Notices::Drain() {
    while (true) {
        ndk::SpAIBinder binder;
        {
            std::lock_guard<std::mutex> lock(queue_mutex);
            if (queue.empty()) {
                draining = false;
                return;
            }
            binder = std::move(queue.front());
            queue.pop_front();
        }
        std::lock_guard<std::mutex> lock(mutex);
        if (callback == nullptr) continue;
        t_notice_of = this;
        // The notice owns the reference it is given.
        AIBinder* owned = binder.get();
        *binder.getR() = nullptr;
        callback(instance, owned, cookie);
        t_notice_of = nullptr;
    }
}

void AServiceManager_NotificationRegistration::Run() {
    const std::string entry = Registry::EntryFileName(name_);
    const auto report = [this] {
        ndk::SpAIBinder binder = ProcessState::Get().Lookup(name_);
        if (binder.get() != nullptr) Notify(std::move(binder));
    };
    // The watch is in place before this first look, so no registration falls between them.
    report();
    alignas(inotify_event) char buffer[sizeof(inotify_event) + NAME_MAX + 1];
    bool go_on = true;
    while (go_on) {
        pollfd fds[2] = {{inotify_fd_.get(), POLLIN, 0}, {wake_fd_.get(), POLLIN, 0}};
        if (poll(fds, 2, -1) < 0) {
            if (errno == EINTR) continue;
            fprintf(stderr, "binder: watching for %s failed: %s\n", name_.c_str(), strerror(errno));
            break;
        }
        if (fds[1].revents != 0) break;
        int registrations = 0;
        ssize_t got;
        while ((got = read(inotify_fd_.get(), buffer, sizeof(buffer))) > 0) {
            for (ssize_t at = 0; at < got;) {
                inotify_event event;
                memcpy(&event, buffer + at, sizeof(event));
                const char* event_name = buffer + at + sizeof(event);
                if (event.len > 0 && entry == event_name) ++registrations;
                // The whole registry was removed: nothing can be registered in it any more.
                if (event.mask & IN_IGNORED) go_on = false;
                at += static_cast<ssize_t>(sizeof(event) + event.len);
            }
        }
        // A device sends a notice for every registration, of the same binder too.
        for (int i = 0; i < registrations && go_on; ++i) report();
    }
}

namespace {

AServiceManager_NotificationRegistration* Register(const char* instance,
                                                   AServiceManager_onRegister onRegister,
                                                   void* cookie, bool on_pool) {
    if (instance == nullptr || onRegister == nullptr || !Registry::IsValidName(instance)) {
        return nullptr;
    }
    auto* registration =
        new AServiceManager_NotificationRegistration(instance, onRegister, cookie, on_pool);
    if (!registration->Start()) {
        delete registration;
        return nullptr;
    }
    return registration;
}

}  // namespace

AServiceManager_NotificationRegistration* vyr_binder::RegisterForNoticesWithoutPool(
    const char* instance, AServiceManager_onRegister callback, void* cookie) {
    return Register(instance, callback, cookie, false);
}

AServiceManager_NotificationRegistration* AServiceManager_registerForServiceNotifications(
    const char* instance, AServiceManager_onRegister onRegister, void* cookie) {
    return Register(instance, onRegister, cookie, true);
}

void AServiceManager_NotificationRegistration_delete(
    AServiceManager_NotificationRegistration* notification) {
    delete notification;
}
