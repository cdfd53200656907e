// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>

namespace vyr_binder {

// This process's transaction buffer, as the binder driver gives one to each process: every
// transaction sent to the process takes its share from arrival until it has been served, all
// senders together. libbinder maps 1 MiB less two pages (ProcessState.cpp, BINDER_VM_SIZE), and
// the driver lets oneway transactions take at most half of it (binder_alloc.c,
// free_async_space). A transaction that does not fit is refused: its sender gets
// STATUS_FAILED_TRANSACTION and the connection lives on.
class TransactionBuffer {
  public:
    static constexpr size_t kBytes = (size_t{1} << 20) - 2 * 4096;
    static constexpr size_t kAsyncBytes = kBytes / 2;

    // What a transaction takes: its data and its object offsets, each rounded up to 8 bytes,
    // at least 8 bytes in all (binder_alloc_new_buf).
    static size_t Footprint(size_t data_bytes, size_t objects);
    // Whether a transaction this large could ever fit.
    static bool Fits(size_t footprint, bool oneway) {
        return footprint <= (oneway ? kAsyncBytes : kBytes);
    }

    // A share of the buffer, given back when it is destroyed.
    class Charge {
      public:
        Charge() = default;
        Charge(Charge&& other) noexcept;
        Charge& operator=(Charge&& other) noexcept;
        Charge(const Charge&) = delete;
        Charge& operator=(const Charge&) = delete;
        ~Charge() { Release(); }

      private:
        friend class TransactionBuffer;
        void Release();
        size_t bytes_ = 0;
        bool oneway_ = false;
    };

    // Takes `footprint` bytes for one transaction; false (and nothing taken) when they do not
    // fit beside what is in flight.
    static bool Reserve(size_t footprint, bool oneway, Charge* charge);
};

}  // namespace vyr_binder
