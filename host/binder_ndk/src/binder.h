// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_ibinder.h>

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>

struct AIBinder_Class {
    std::string descriptor;
    AIBinder_Class_onCreate on_create = nullptr;
    AIBinder_Class_onDestroy on_destroy = nullptr;
    AIBinder_Class_onTransact on_transact = nullptr;
    AIBinder_onDump on_dump = nullptr;
    AIBinder_handleShellCommand handle_shell_command = nullptr;
    bool write_header = true;
};

namespace vyr_binder {

class DeathRecipientState;
struct DeathLink;

// Strong and weak counts of one binder. The binder dies when the strong count reaches zero and
// never comes back; the block itself lives while weak references remain.
class RefCounts {
  public:
    explicit RefCounts(AIBinder* object) : object_(object) {}

    void IncWeak() { weak_.fetch_add(1, std::memory_order_relaxed); }
    void DecWeak() {
        if (weak_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
    }
    // A strong reference to the binder, or null when it is already dying.
    AIBinder* Promote();
    AIBinder* object() const { return object_; }

  private:
    friend struct ::AIBinder;
    std::atomic<int32_t> strong_{1};
    // One weak reference belongs to the binder itself.
    std::atomic<int32_t> weak_{1};
    AIBinder* const object_;
};

// Interface token at the start of every user transaction: a marker, then the descriptor.
constexpr int32_t kInterfaceTokenMarker = 0x56595254;
constexpr transaction_code_t kPingTransaction = ('_' << 24) | ('P' << 16) | ('N' << 8) | 'G';
constexpr transaction_code_t kInterfaceTransaction = ('_' << 24) | ('N' << 16) | ('T' << 8) | 'F';
constexpr transaction_code_t kDumpTransaction = ('_' << 24) | ('D' << 16) | ('M' << 8) | 'P';

inline bool IsUserCode(transaction_code_t code) {
    return code >= FIRST_CALL_TRANSACTION && code <= LAST_CALL_TRANSACTION;
}

}  // namespace vyr_binder

struct AIBinder {
  public:
    explicit AIBinder(const AIBinder_Class* clazz);
    AIBinder(const AIBinder&) = delete;
    AIBinder& operator=(const AIBinder&) = delete;

    void IncStrong() { refs_->strong_.fetch_add(1, std::memory_order_relaxed); }
    void DecStrong();
    int32_t StrongCount() const { return refs_->strong_.load(std::memory_order_relaxed); }
    vyr_binder::RefCounts* refs() const { return refs_; }

    const AIBinder_Class* GetClass() const { return clazz_.load(std::memory_order_acquire); }
    bool AssociateClass(const AIBinder_Class* clazz);

    virtual bool IsRemote() const = 0;
    virtual bool IsAlive() const = 0;
    virtual void* UserData() const { return nullptr; }
    // The interface descriptor this binder answers to, empty when unknown.
    virtual std::string Descriptor() const = 0;
    // `in` is positioned at its start; `out` receives the reply (empty for oneway).
    virtual binder_status_t Transact(transaction_code_t code, AParcel* in, AParcel* out,
                                     binder_flags_t flags) = 0;
    virtual binder_status_t Dump(int fd, const char** args, uint32_t num_args) = 0;
    virtual binder_status_t LinkToDeath(const vyr_binder::DeathLink& link) = 0;
    virtual binder_status_t UnlinkToDeath(
        const std::shared_ptr<vyr_binder::DeathRecipientState>& recipient, void* cookie) = 0;
    // Removes every link of this recipient, for a recipient being deleted.
    virtual void DropLinksOf(const vyr_binder::DeathRecipientState* recipient) = 0;

  protected:
    // Binders are destroyed only through DecStrong.
    virtual ~AIBinder();

  private:
    vyr_binder::RefCounts* refs_;
    std::atomic<const AIBinder_Class*> clazz_;
};

struct AIBinder_Weak {
    vyr_binder::RefCounts* refs;
};
