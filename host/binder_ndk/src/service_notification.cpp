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
#include <cstring>

#include "process_state.h"
#include "registry.h"

using vyr_binder::ProcessState;
using vyr_binder::Registry;

AServiceManager_NotificationRegistration::AServiceManager_NotificationRegistration(
    std::string name, AServiceManager_onRegister callback, void* cookie)
    : name_(std::move(name)), callback_(callback), cookie_(cookie) {}

AServiceManager_NotificationRegistration::~AServiceManager_NotificationRegistration() {
    if (thread_.joinable()) {
        const uint64_t one = 1;
        (void)!write(wake_fd_.get(), &one, sizeof(one));
        thread_.join();
    }
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

void AServiceManager_NotificationRegistration::Delete() {
    if (thread_.joinable() && thread_.get_id() == std::this_thread::get_id()) {
        delete_on_return_ = true;
        return;
    }
    delete this;
}

void AServiceManager_NotificationRegistration::Run() {
    const std::string entry = Registry::EntryFileName(name_);
    // Held so that a new registration is told apart from the one last reported.
    ndk::SpAIBinder reported;
    const auto report = [&] {
        ndk::SpAIBinder binder = ProcessState::Get().Lookup(name_);
        if (binder.get() == nullptr || binder.get() == reported.get()) return true;
        reported = binder;
        callback_(name_.c_str(), binder.get(), cookie_);
        return !delete_on_return_;
    };
    // The watch is in place before this first look, so no registration falls between them.
    bool go_on = report();
    alignas(inotify_event) char buffer[sizeof(inotify_event) + NAME_MAX + 1];
    while (go_on) {
        pollfd fds[2] = {{inotify_fd_.get(), POLLIN, 0}, {wake_fd_.get(), POLLIN, 0}};
        if (poll(fds, 2, -1) < 0) {
            if (errno == EINTR) continue;
            fprintf(stderr, "binder: watching for %s failed: %s\n", name_.c_str(), strerror(errno));
            break;
        }
        if (fds[1].revents != 0) break;
        bool changed = false;
        ssize_t got;
        while ((got = read(inotify_fd_.get(), buffer, sizeof(buffer))) > 0) {
            for (ssize_t at = 0; at < got;) {
                inotify_event event;
                memcpy(&event, buffer + at, sizeof(event));
                const char* event_name = buffer + at + sizeof(event);
                if (event.len > 0 && entry == event_name) changed = true;
                // The whole registry was removed: nothing can be registered in it any more.
                if (event.mask & IN_IGNORED) go_on = false;
                at += static_cast<ssize_t>(sizeof(event) + event.len);
            }
        }
        if (changed && go_on) go_on = report();
    }
    if (delete_on_return_) {
        // Deleted from its own notice: nobody joins this thread.
        thread_.detach();
        delete this;
    }
}

AServiceManager_NotificationRegistration* AServiceManager_registerForServiceNotifications(
    const char* instance, AServiceManager_onRegister onRegister, void* cookie) {
    if (instance == nullptr || onRegister == nullptr || !Registry::IsValidName(instance)) {
        return nullptr;
    }
    auto* registration = new AServiceManager_NotificationRegistration(instance, onRegister, cookie);
    if (!registration->Start()) {
        delete registration;
        return nullptr;
    }
    return registration;
}

void AServiceManager_NotificationRegistration_delete(
    AServiceManager_NotificationRegistration* notification) {
    if (notification != nullptr) notification->Delete();
}
