// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <apex_update_listener.h>

#include <memory>
#include <set>
#include <string>

// Builds listeners whose thread reads event records from a descriptor the test feeds, in place
// of an inotify instance. With no watch to remove, the test ends the feed before destruction.
class ApexUpdateListenerTestPeer {
  public:
    static std::unique_ptr<ApexUpdateListener> MakeWithEventSource(
        const std::string& package, const std::string& path, ApexUpdateListener::Callback callback,
        int event_fd, const std::set<ApexUpdateListener::Info>& initial_info) {
        return std::make_unique<ApexUpdateListener>(ApexUpdateListener::Sigil{}, package, path,
                                                    std::move(callback), event_fd,
                                                    /*watch_descriptor=*/-1, initial_info);
    }
};
