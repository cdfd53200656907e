// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace vyr_test::apex {

// A socket pair standing in for an inotify instance: every Send arrives as one read of the
// listener's end, so tests choose exactly which event records a read returns.
class EventFeed {
  public:
    EventFeed();
    ~EventFeed();
    EventFeed(const EventFeed&) = delete;
    EventFeed& operator=(const EventFeed&) = delete;

    // The end the listener reads; the caller owns it from then on.
    int TakeListenerEnd();
    // One 16-byte event header with the given mask and no name.
    static std::string Record(uint32_t mask);
    // Sends the bytes as one read; false (with a test failure) on error.
    bool Send(const std::string& bytes);
    bool SendRecords(const std::vector<uint32_t>& masks);
    // Ends the feed: the listener's reads then return 0 at once.
    void Close();

  private:
    int listener_end_ = -1;
    int test_end_ = -1;
};

}  // namespace vyr_test::apex
