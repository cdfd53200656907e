// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "apex_update_listener"

#include "apex_update_listener.h"

#include <log/log.h>
#include <sys/inotify.h>
#include <tinyxml2.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <tuple>
#include <utility>

namespace {

constexpr uint32_t kWatchMask = IN_MODIFY | IN_CREATE | IN_DELETE;
constexpr size_t kEventBufferSize = 256;
// The watch is on the file itself, so events carry no name: each is a bare header.
constexpr size_t kEventSize = sizeof(inotify_event);
static_assert(kEventSize == 16, "inotify event header is four 32-bit fields");

// strtol must cover the whole range of version codes.
static_assert(sizeof(long) == sizeof(int64_t), "long must be 64 bits wide");

bool IsTrue(const char* text) {
    return strcmp(text, "true") == 0;
}

}  // namespace

bool ApexUpdateListener::Info::operator<(const Info& other) const {
    return std::tie(is_active, is_factory, version_code, version_name, module_path,
                    preinstalled_module_path, module_name) <
           std::tie(other.is_active, other.is_factory, other.version_code, other.version_name,
                    other.module_path, other.preinstalled_module_path, other.module_name);
}

ApexUpdateListener::ApexUpdateListener(Sigil, const std::string& package, const std::string& path,
                                       Callback callback, int inotify_fd, int watch_descriptor,
                                       const std::set<Info>& initial_info)
    : package_name_(package),
      info_list_path_(path),
      callback_(std::move(callback)),
      running_(true),
      inotify_fd_(inotify_fd),
      watch_descriptor_(watch_descriptor),
      current_info_(initial_info),
      thread_(&ApexUpdateListener::ThreadFunction, this) {}

ApexUpdateListener::~ApexUpdateListener() {
    running_ = false;
    // Removing the watch queues IN_IGNORED, which wakes the thread's blocked read.
    if (watch_descriptor_ >= 0) {
        inotify_rm_watch(inotify_fd_, watch_descriptor_);
    }
    // Join before closing: closing does not wake a blocked read on Linux, and until the thread
    // has returned it may still read the descriptor, whose number another open could reuse.
    if (thread_.joinable()) {
        thread_.join();
    }
    if (inotify_fd_ >= 0) {
        close(inotify_fd_);
    }
}

std::unique_ptr<ApexUpdateListener> ApexUpdateListener::Make(const std::string& package,
                                                             Callback callback,
                                                             bool invoke_with_initial_version,
                                                             const std::string& path) {
    int inotify_fd = inotify_init();
    if (inotify_fd < 0) {
        int error = errno;
        ALOGE("Failed to inotify_init(): %s (%d)", strerror(error), error);
        return nullptr;
    }
    int watch_descriptor = inotify_add_watch(inotify_fd, path.c_str(), kWatchMask);
    if (watch_descriptor < 0) {
        int error = errno;
        ALOGE("Failed to inotify_add_watch(%s): %s (%d)", path.c_str(), strerror(error), error);
        close(inotify_fd);
        return nullptr;
    }
    // The instance and its watch stay open on the two failures below.
    if (!callback) {
        ALOGE("Called with null callback");
        return nullptr;
    }
    std::optional<std::set<Info>> initial_info = TrySlurpInfo(package, path);
    if (!initial_info) {
        ALOGE("Could not slurp info from %s for package %s", path.c_str(), package.c_str());
        return nullptr;
    }
    if (invoke_with_initial_version) {
        callback({}, *initial_info);
    }
    return std::make_unique<ApexUpdateListener>(Sigil{}, package, path, std::move(callback),
                                                inotify_fd, watch_descriptor, *initial_info);
}

std::optional<std::set<ApexUpdateListener::Info>> ApexUpdateListener::TrySlurpInfo(
    const std::string& package, const std::string& path) {
    tinyxml2::XMLDocument document;
    tinyxml2::XMLError result = document.LoadFile(path.c_str());
    if (result != tinyxml2::XML_SUCCESS) {
        ALOGE("XML parsing failed: %d", result);
        return std::nullopt;
    }
    const tinyxml2::XMLElement* list = document.FirstChildElement("apex-info-list");
    if (list == nullptr) {
        ALOGE("XML did not contain apex-info-list");
        return std::nullopt;
    }

    std::set<Info> infos;
    for (const tinyxml2::XMLElement* entry = list->FirstChildElement("apex-info"); entry != nullptr;
         entry = entry->NextSiblingElement("apex-info")) {
        if (entry->Attribute("moduleName", package.c_str()) == nullptr) {
            continue;
        }
        Info info;
        info.module_name = package;
        if (const char* text = entry->Attribute("modulePath")) {
            info.module_path = text;
        }
        if (const char* text = entry->Attribute("preinstalledModulePath")) {
            info.preinstalled_module_path = text;
        }
        if (const char* text = entry->Attribute("versionCode")) {
            // Bad text is not an error: it reads as its leading number, or 0.
            info.version_code = strtol(text, nullptr, 10);
        }
        if (const char* text = entry->Attribute("versionName")) {
            info.version_name = text;
        }
        if (const char* text = entry->Attribute("isActive")) {
            info.is_active = IsTrue(text);
        }
        if (const char* text = entry->Attribute("isFactory")) {
            info.is_factory = IsTrue(text);
        }
        infos.insert(std::move(info));
    }
    if (infos.empty()) {
        ALOGE("XML did not contain any apex-info about %s", package.c_str());
        return std::nullopt;
    }
    return infos;
}

void ApexUpdateListener::ThreadFunction() {
    // Zero-filled by value-initialisation.
    auto buffer = std::make_unique<uint8_t[]>(kEventBufferSize);
    while (true) {
        ssize_t length = read(inotify_fd_, buffer.get(), kEventBufferSize);
        // A raw system call would report an interruption this way; libc's read reports it as -1
        // with errno, which ends the thread below like any other failure.
        if (length == -EINTR) {
            if (!running_) {
                return;
            }
            continue;
        }
        if (length < 0 || !running_) {
            if (running_) {
                int error = errno;
                ALOGE("Error reading inotify event from '%s': %s (%d)", info_list_path_.c_str(),
                      strerror(error), error);
            }
            return;
        }
        size_t count = static_cast<size_t>(length) / kEventSize;
        for (size_t i = 0; i < count; ++i) {
            inotify_event event;
            memcpy(&event, buffer.get() + i * kEventSize, kEventSize);
            HandleEvent(event.mask);
        }
        if (!running_) {
            return;
        }
    }
}

void ApexUpdateListener::HandleEvent(uint32_t mask) {
    const char* kind = (mask & IN_ISDIR) != 0 ? "directory" : "file";
    if ((mask & IN_CREATE) != 0) {
        ALOGI("%s created as %s", info_list_path_.c_str(), kind);
        if ((mask & IN_DELETE) != 0) {
            return;
        }
    } else if ((mask & IN_DELETE) != 0) {
        ALOGI("%s deleted as %s", info_list_path_.c_str(), kind);
        return;
    } else if ((mask & IN_MODIFY) != 0) {
        ALOGI("%s modified as %s", info_list_path_.c_str(), kind);
    }
    // Creation, modification and any other event (IN_IGNORED, a queue overflow) may hide a change.
    CheckForUpdate();
}

void ApexUpdateListener::CheckForUpdate() {
    std::optional<std::set<Info>> new_info = TrySlurpInfo(package_name_, info_list_path_);
    if (!new_info) {
        NoteReload("unreadable");
        return;
    }
    auto equivalent = [](const Info& a, const Info& b) { return !(a < b) && !(b < a); };
    if (new_info->size() == current_info_.size() &&
        std::equal(current_info_.begin(), current_info_.end(), new_info->begin(), equivalent)) {
        NoteReload("unchanged");
        return;
    }
    NoteReload("changed");
    if (callback_) {
        callback_(current_info_, *new_info);
        std::lock_guard<std::mutex> lock(status_mutex_);
        current_info_ = std::move(*new_info);
    }
}

void ApexUpdateListener::NoteReload(const std::string& outcome) {
    std::function<void(const std::string&)> observer;
    {
        std::lock_guard<std::mutex> lock(status_mutex_);
        ++reloads_;
        observer = reload_observer_;
    }
    if (observer) observer(outcome);
}

ApexUpdateListener::Status ApexUpdateListener::GetStatus() const {
    std::lock_guard<std::mutex> lock(status_mutex_);
    return Status{package_name_, info_list_path_, current_info_, reloads_};
}

void ApexUpdateListener::SetReloadObserver(std::function<void(const std::string&)> observer) {
    std::lock_guard<std::mutex> lock(status_mutex_);
    reload_observer_ = std::move(observer);
}
