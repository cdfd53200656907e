// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android-base/thread_annotations.h>
#include <android/binder_auto_utils.h>
#include <android/binder_ibinder.h>
#include <sys/types.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "frame_io.h"
#include "parcel.h"
#include "transaction_buffer.h"
#include "unique_lock.h"
#include "wire.h"

namespace vyr_binder {

class ProxyBinder;

// One socket to one peer process, used both ways. One thread at a time reads it (it holds the
// reading role): a caller waiting for its reply reads for itself when nobody else is, otherwise
// a runtime thread woken by the looper does. Replies go to the thread waiting for them, calls
// nested in one of ours to the thread that made it, other calls to a pool thread.
class Connection : public std::enable_shared_from_this<Connection> {
  public:
    // Takes a connected socket; the peer's credentials come from the socket.
    explicit Connection(int fd);
    ~Connection();
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    // Introduces this process; the connection must already be in the looper.
    void Start(const std::string& own_key);
    // Arms the connection in the looper once it is there: for any input when `input` (the peer
    // may call this process), otherwise only for the peer's hang-up.
    void Watch(bool input);
    // From now on the peer may call this process: its input is watched too.
    void WatchInput();
    // The looper saw data (and the peer's hang-up when `hung_up`): read one frame, then serve a
    // call in it here (can_serve) or queue it.
    void OnReadable(bool can_serve, bool hung_up);

    int fd() const { return fd_; }
    uint64_t serial() const { return serial_; }
    void set_serial(uint64_t serial) { serial_ = serial; }

    binder_status_t Transact(uint64_t target, transaction_code_t code, const AParcel& in,
                             AParcel* out, binder_flags_t flags);
    // The binder the peer published under `name`, or null.
    binder_status_t Lookup(const std::string& name, ndk::SpAIBinder* binder);

    bool dead() const { return dead_.load(std::memory_order_acquire); }
    pid_t peer_pid() const { return peer_pid_; }
    uid_t peer_uid() const { return peer_uid_; }
    // Ends the connection: the peer's objects die here and ours lose this peer's references.
    void Close();

    void ForgetProxy(ProxyBinder* proxy);

  private:
    struct Incoming {
        uint64_t id;
        uint32_t code;
        uint32_t flags;
        std::unique_ptr<AParcel> data;
        ndk::SpAIBinder target;
        bool drain_oneway = false;  // run the target's queued oneway calls instead
        // Its share of this process's transaction buffer, held until it has been served.
        TransactionBuffer::Charge charge;
    };
    // A thread waiting for the reply to one of its transactions.
    struct Waiter {
        std::condition_variable cv;
        bool done = false;
        binder_status_t status = STATUS_OK;
        std::unique_ptr<AParcel> reply;
        std::vector<std::shared_ptr<Incoming>> nested;  // oldest first
    };
    struct Export {
        ndk::SpAIBinder binder;
        uint64_t count = 0;
    };

    // Takes what the socket has (with `wait`, at least one frame) and handles the frames in
    // stream order; a call to run is left in `call`. False when the connection is finished.
    bool ReadAndHandle(bool wait, std::shared_ptr<Incoming>* call);
    // False when the peer broke the protocol.
    bool HandleFrame(Frame& frame, std::shared_ptr<Incoming>* call);
    bool HandleTransaction(Frame& frame, std::shared_ptr<Incoming>* call);
    bool HandleReply(Frame& frame);
    void HandleRelease(uint64_t id, uint32_t count);
    void Dispatch(std::shared_ptr<Incoming> call, bool can_serve);
    void ServeContextCall(Incoming& call);
    // What the connection is armed for in the looper. A peer that holds nothing of this process
    // can only answer calls (the callers read those answers themselves) or hang up, so only its
    // hang-up is watched: a call then costs no re-arming.
    enum class Armed { kNone, kHangUp, kInput };
    Armed WantedLocked() const REQUIRES(mutex_) {
        return watch_input_ ? Armed::kInput : Armed::kHangUp;
    }
    void ArmLocked(Armed armed) REQUIRES(mutex_);
    // A caller takes the reading role to read its own reply.
    void TakeReadingRoleLocked() REQUIRES(mutex_);
    // Arms as wanted when the reading role is given back.
    void RearmLocked() REQUIRES(mutex_);
    void WatchInputLocked() REQUIRES(mutex_);
    void Serve(Incoming& call);
    binder_status_t ServeDump(Incoming& call);
    void Die();

    // Resolves the object table of a received parcel into binders.
    bool DecodeParcel(Frame& frame, AParcel* parcel);
    binder_status_t EncodeObjectsLocked(const AParcel& parcel, std::vector<WireObject>* objects)
        REQUIRES(mutex_);
    ndk::SpAIBinder ProxyForLocked(uint64_t id, const std::string& descriptor) REQUIRES(mutex_);
    Waiter* FindWaiterLocked(uint64_t id) const REQUIRES(mutex_);
    void RemoveWaiterLocked(uint64_t id) REQUIRES(mutex_);
    // The `descriptors` go with the frame's first byte: copies of the parcel's, since the frame
    // may wait in the queue after the parcel is gone.
    bool Send(FrameType type, uint32_t code, uint32_t flags, uint64_t id, uint64_t target,
              uint64_t parent, const AParcel* parcel, const std::vector<WireObject>& objects,
              std::vector<ndk::ScopedFileDescriptor> descriptors = {});
    // Sends queued bytes until the socket is full or the queue is empty; false when the peer is
    // gone.
    bool SendPendingLocked() REQUIRES(send_mutex_);
    void SendReply(uint64_t id, binder_status_t status, const AParcel& reply);
    // Sends what the socket would not take at once, on a runtime thread, as the peer reads.
    void FlushPending();
    // Takes the call's share of the transaction buffer; false when it does not fit.
    bool AdmitCall(Incoming* call);

    const int fd_;
    uint64_t serial_ = 0;
    pid_t peer_pid_ = -1;
    uid_t peer_uid_ = static_cast<uid_t>(-1);
    std::atomic<bool> dead_{false};

    std::mutex send_mutex_;
    // Frames, or their tails, that the peer has not taken yet; sent in order before anything
    // new.
    std::vector<uint8_t> pending_out_ GUARDED_BY(send_mutex_);
    size_t pending_sent_ GUARDED_BY(send_mutex_) = 0;
    // The descriptors of queued frames, in order, each to go with the first byte of its frame,
    // which starts `at` bytes into pending_out_.
    struct PendingDescriptors {
        size_t at;
        std::vector<ndk::ScopedFileDescriptor> descriptors;
    };
    std::deque<PendingDescriptors> pending_descriptors_ GUARDED_BY(send_mutex_);
    bool flushing_ GUARDED_BY(send_mutex_) = false;
    // Set once the peer let too much pile up; the connection is on its way out.
    bool send_refused_ GUARDED_BY(send_mutex_) = false;

    std::mutex mutex_;
    uint64_t next_transaction_id_ GUARDED_BY(mutex_) = 1;
    // Few at a time: a flat table spares an allocation per call.
    std::vector<std::pair<uint64_t, Waiter*>> waiters_ GUARDED_BY(mutex_);
    std::unordered_map<uint64_t, Export> exports_ GUARDED_BY(mutex_);
    std::unordered_map<uint64_t, ProxyBinder*> proxies_ GUARDED_BY(mutex_);
    bool hello_seen_ GUARDED_BY(mutex_) = false;
    bool reading_ GUARDED_BY(mutex_) = false;  // the reading role is taken
    bool watch_input_ GUARDED_BY(mutex_) = false;
    Armed armed_ GUARDED_BY(mutex_) = Armed::kNone;
    // Data or a hang-up woke a thread while the role was taken: its holder arms again.
    bool more_ GUARDED_BY(mutex_) = false;
    // The peer hung up: its last bytes and the end of the stream come with no further wake-up,
    // so the reader arms again until a read finds the end.
    bool hung_up_ GUARDED_BY(mutex_) = false;
    FrameBuffer buffer_;  // used by the holder of the reading role only
};

}  // namespace vyr_binder
