// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// A peer of the host binder runtime that speaks its wire format by hand: it can do what the
// runtime itself never does (announce frames it never sends, leave replies unread), which is
// what the limits on peers are tested and measured with.

#include <cstdint>
#include <string>
#include <vector>

namespace vyr_test {

class RawPeer {
  public:
    // Connects to the process that published `service` in the registry `registry_dir`.
    RawPeer(const std::string& registry_dir, const std::string& service);
    ~RawPeer();
    RawPeer(const RawPeer&) = delete;
    RawPeer& operator=(const RawPeer&) = delete;

    bool connected() const { return fd_ >= 0; }
    int fd() const { return fd_; }

    // The service's object id in its process, asked by name and read from the reply; 0 on
    // failure. Reads (and drops) whatever else arrives first.
    uint64_t LookUp(const std::string& service);
    // Sends a frame header announcing a transaction of `data_size` bytes, and nothing more.
    bool SendHeaderOnly(uint32_t data_size);
    // A call of interface method `index` of `descriptor` with int32 arguments, as a generated
    // proxy sends it; whole or not at all, without waiting when `wait` is false.
    bool SendCall(uint64_t target, uint64_t id, const std::string& descriptor, uint32_t index,
                  const std::vector<int32_t>& args, uint32_t flags = 0, bool wait = true);
    // `count` oneway calls of method `index` with one int32 argument, 1 to `count`, in one
    // write: all of them are in the socket before the other side wakes.
    bool SendOnewayBurst(uint64_t target, const std::string& descriptor, uint32_t index,
                         int32_t count);
    // Bytes sent that the other side has not read yet.
    int Unread() const;
    // True once the other side closed the connection.
    bool HungUp() const;

  private:
    int fd_ = -1;
};

}  // namespace vyr_test
