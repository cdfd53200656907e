// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "connection.h"

#include <android/binder_parcel_utils.h>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <utility>

#include "call_context.h"
#include "dump_arguments.h"
#include "frame_io.h"
#include "local_binder.h"
#include "looper.h"
#include "process_state.h"
#include "proxy_binder.h"
#include "unique_lock.h"

namespace vyr_binder {
namespace {

// Object id 0 is the process itself; it answers name lookups.
constexpr uint64_t kContextObject = 0;
constexpr transaction_code_t kLookupCode = 1;
constexpr size_t kMaxKeyBytes = 128;

Looper& TheLooper() {
    return ProcessState::Get().looper();
}

// What a parcel takes of a transaction buffer: a device's parcel holds each descriptor as an
// object, with its offset, as it holds a binder.
size_t FootprintOf(const AParcel& parcel) {
    return TransactionBuffer::Footprint(parcel.data.size(),
                                        parcel.objects.size() + parcel.fds.size());
}

// Copies of a parcel's descriptors for the frame that carries them; false when this process has
// no descriptor left for them.
bool DuplicateDescriptors(const std::vector<ndk::ScopedFileDescriptor>& from,
                          std::vector<ndk::ScopedFileDescriptor>* to) {
    to->reserve(from.size());
    for (const ndk::ScopedFileDescriptor& descriptor : from) {
        to->emplace_back(fcntl(descriptor.get(), F_DUPFD_CLOEXEC, 0));
        if (to->back().get() < 0) return false;
    }
    return true;
}

// The proxies of a dead peer, weakly held until their notices have run (or were dropped).
struct WeakProxies {
    WeakProxies() = default;
    WeakProxies(const WeakProxies&) = delete;
    WeakProxies& operator=(const WeakProxies&) = delete;
    ~WeakProxies() {
        for (RefCounts* ref : refs) ref->DecWeak();
    }
    std::vector<RefCounts*> refs;
};

}  // namespace

Connection::Connection(int fd) : fd_(fd) {
    waiters_.reserve(16);
    ucred cred{};
    socklen_t len = sizeof(cred);
    if (getsockopt(fd_, SOL_SOCKET, SO_PEERCRED, &cred, &len) == 0) {
        peer_pid_ = cred.pid;
        peer_uid_ = cred.uid;
    }
}

Connection::~Connection() {
    close(fd_);
}

void Connection::Start(const std::string& own_key) {
    AParcel hello;
    hello.data.assign(own_key.begin(), own_key.end());
    if (!Send(FrameType::kHello, 0, 0, 0, 0, 0, &hello, {})) Close();
}

void Connection::Close() {
    shutdown(fd_, SHUT_RDWR);
}

void Connection::Watch(bool input) {
    std::lock_guard<std::mutex> lock(mutex_);
    watch_input_ = watch_input_ || input;
    if (!reading_ && !dead_.load(std::memory_order_relaxed)) ArmLocked(WantedLocked());
}

void Connection::WatchInput() {
    std::lock_guard<std::mutex> lock(mutex_);
    WatchInputLocked();
}

void Connection::WatchInputLocked() {
    watch_input_ = true;
    // Whoever reads re-arms when done.
    if (!reading_ && armed_ == Armed::kHangUp && !dead_.load(std::memory_order_relaxed)) {
        ArmLocked(Armed::kInput);
    }
}

void Connection::ArmLocked(Armed armed) {
    if (armed == Armed::kNone) {
        TheLooper().Disarm(*this);
    } else {
        TheLooper().Arm(*this, armed == Armed::kInput);
    }
    armed_ = armed;
}

void Connection::OnReadable(bool can_serve, bool hung_up) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        hung_up_ = hung_up_ || hung_up;
        // Whoever holds the role arms again for what woke this thread.
        if (reading_ || dead_.load(std::memory_order_relaxed)) {
            more_ = true;
            return;
        }
        reading_ = true;
        more_ = false;
    }
    std::shared_ptr<Incoming> call;
    bool alive = ReadAndHandle(false, &call);
    {
        std::lock_guard<std::mutex> lock(mutex_);
        reading_ = false;
        if (alive) RearmLocked();
    }
    if (!alive) {
        Die();
        return;
    }
    if (call != nullptr) Dispatch(std::move(call), can_serve);
}

void Connection::TakeReadingRoleLocked() {
    reading_ = true;
    // The caller reads for itself: input must not wake a looper thread meanwhile.
    if (armed_ == Armed::kInput) ArmLocked(Armed::kNone);
}

void Connection::RearmLocked() {
    if (dead_.load(std::memory_order_relaxed)) {
        // It died while this thread read it, and nobody reads it again.
        buffer_.Clear();
        return;
    }
    // Only new data wakes a thread again; arming does it for what is already there: bytes one
    // read did not take (another connection's turn first), data or a hang-up whose wake-up
    // found the role taken, or the end of the stream behind the last bytes of a peer that hung up.
    if (more_ || hung_up_ || !buffer_.drained() || armed_ != WantedLocked()) {
        ArmLocked(WantedLocked());
    }
    more_ = false;
}

bool Connection::ReadAndHandle(bool wait, std::shared_ptr<Incoming>* call) {
    FrameBuffer::Result result = buffer_.Fill(fd_, wait);
    if (result == FrameBuffer::Result::kNoData) return true;
    if (result == FrameBuffer::Result::kOverLimit) {
        fprintf(stderr, "binder: dropping peer %d: receive buffers over %zu bytes in all\n",
                peer_pid_, kMaxBufferedBytesPerProcess);
        return false;
    }
    while (result == FrameBuffer::Result::kFrame) {
        Frame frame;
        buffer_.Take(&frame);
        std::shared_ptr<Incoming> next;
        if (!HandleFrame(frame, &next)) return false;
        if (next != nullptr) {
            // One call is served by the reader itself; any other that came with it is queued.
            if (*call == nullptr) {
                *call = std::move(next);
            } else {
                Dispatch(std::move(next), false);
            }
        }
        result = buffer_.Check();
    }
    return result == FrameBuffer::Result::kNoData;
}

bool Connection::HandleFrame(Frame& frame, std::shared_ptr<Incoming>* call) {
    const FrameHeader& header = frame.header;
    switch (static_cast<FrameType>(header.type)) {
        case FrameType::kHello: {
            if (header.data_size == 0 || header.data_size > kMaxKeyBytes) return false;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                if (hello_seen_) return false;
                hello_seen_ = true;
            }
            std::string key(frame.data.begin(), frame.data.end());
            ProcessState::Get().NamePeer(shared_from_this(), key);
            return true;
        }
        case FrameType::kRelease:
            HandleRelease(header.target, header.code);
            return true;
        case FrameType::kTransaction:
            return HandleTransaction(frame, call);
        case FrameType::kReply:
            return HandleReply(frame);
    }
    return false;
}

bool Connection::DecodeParcel(Frame& frame, AParcel* parcel) {
    std::vector<WireObject> objects;
    if (!DecodeObjects(frame.table.data(), frame.table.size(), frame.header.object_count, &objects)) {
        return false;
    }
    parcel->data = std::move(frame.data);
    parcel->fds = std::move(frame.descriptors);
    std::vector<ParcelObject> resolved;
    resolved.reserve(objects.size());
    bool ok = true;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        for (const WireObject& object : objects) {
            if (object.kind == ObjectKind::kSenderObject) {
                resolved.push_back(ParcelObject{0, ProxyForLocked(object.id, object.descriptor)});
                continue;
            }
            // The peer can only name an object of ours it holds a reference to.
            auto it = exports_.find(object.id);
            if (it == exports_.end()) {
                ok = false;
                break;
            }
            resolved.push_back(ParcelObject{0, it->second.binder});
        }
    }
    // Released outside the lock: dropping a proxy takes it.
    parcel->objects = std::move(resolved);
    return ok;
}

ndk::SpAIBinder Connection::ProxyForLocked(uint64_t id, const std::string& descriptor) {
    auto it = proxies_.find(id);
    if (it != proxies_.end()) {
        AIBinder* alive = it->second->refs()->Promote();
        if (alive != nullptr) {
            ++it->second->acquired_;
            return ndk::SpAIBinder(alive);
        }
    }
    ProxyBinder* proxy = new ProxyBinder(shared_from_this(), id, descriptor);
    proxy->acquired_ = 1;
    proxies_[id] = proxy;
    return ndk::SpAIBinder(proxy);
}

Connection::Waiter* Connection::FindWaiterLocked(uint64_t id) const {
    for (const auto& entry : waiters_) {
        if (entry.first == id) return entry.second;
    }
    return nullptr;
}

void Connection::RemoveWaiterLocked(uint64_t id) {
    for (auto& entry : waiters_) {
        if (entry.first == id) {
            entry = waiters_.back();
            waiters_.pop_back();
            return;
        }
    }
}

void Connection::ForgetProxy(ProxyBinder* proxy) {
    uint32_t acquired;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = proxies_.find(proxy->remote_id());
        if (it != proxies_.end() && it->second == proxy) proxies_.erase(it);
        acquired = proxy->acquired_;
        if (dead_.load(std::memory_order_relaxed)) return;
    }
    if (acquired == 0) return;
    Send(FrameType::kRelease, acquired, 0, 0, proxy->remote_id(), 0, nullptr, {});
}

void Connection::HandleRelease(uint64_t id, uint32_t count) {
    ndk::SpAIBinder dropped;
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = exports_.find(id);
    if (it == exports_.end()) return;
    if (it->second.count <= count) {
        dropped = std::move(it->second.binder);
        exports_.erase(it);
    } else {
        it->second.count -= count;
    }
    // `dropped` is declared first, so it is released after the lock.
}

binder_status_t Connection::EncodeObjectsLocked(const AParcel& parcel,
                                                std::vector<WireObject>* objects) {
    for (const ParcelObject& object : parcel.objects) {
        AIBinder* binder = object.binder.get();
        if (binder->IsRemote() && static_cast<ProxyBinder*>(binder)->connection().get() != this) {
            // Handing a third process's object on is not supported.
            return STATUS_INVALID_OPERATION;
        }
    }
    objects->reserve(parcel.objects.size());
    for (const ParcelObject& object : parcel.objects) {
        AIBinder* binder = object.binder.get();
        if (binder->IsRemote()) {
            objects->push_back(WireObject{
                ObjectKind::kReceiverObject, static_cast<ProxyBinder*>(binder)->remote_id(), {}});
            continue;
        }
        LocalBinder* local = static_cast<LocalBinder*>(binder);
        uint64_t id = local->ExportId();
        // The peer learns of the object from this frame and may call it from then on.
        if (!watch_input_) WatchInputLocked();
        Export& entry = exports_[id];
        if (entry.binder.get() == nullptr) entry.binder = object.binder;
        ++entry.count;
        objects->push_back(WireObject{ObjectKind::kSenderObject, id, local->Descriptor()});
    }
    return STATUS_OK;
}

bool Connection::Send(FrameType type, uint32_t code, uint32_t flags, uint64_t id, uint64_t target,
                      uint64_t parent, const AParcel* parcel, const std::vector<WireObject>& objects,
                      std::vector<ndk::ScopedFileDescriptor> descriptors) {
    std::vector<uint8_t> table;
    if (!objects.empty()) EncodeObjects(objects, &table);
    FrameHeader header{};
    header.magic = kFrameMagic;
    header.type = static_cast<uint32_t>(type);
    header.flags = flags;
    header.code = code;
    header.data_size = parcel == nullptr ? 0 : static_cast<uint32_t>(parcel->data.size());
    header.object_count = static_cast<uint32_t>(objects.size());
    header.table_size = static_cast<uint32_t>(table.size());
    header.transaction_id = id;
    header.target = target;
    header.parent = parent;
    header.descriptor_count = static_cast<uint32_t>(descriptors.size());
    iovec iov[3] = {
        {&header, sizeof(header)},
        {parcel == nullptr ? nullptr : const_cast<uint8_t*>(parcel->data.data()), header.data_size},
        {table.data(), table.size()},
    };
    const size_t total = sizeof(header) + header.data_size + table.size();
    UniqueLock lock(send_mutex_);
    if (send_refused_) return false;
    size_t sent = 0;
    // Never wait for a peer: one that does not read must not hold this thread, which may be the
    // one that other peers' calls need.
    if (pending_out_.empty() && !SendSome(fd_, iov, 3, &sent, descriptors)) return false;
    if (sent == total) return true;
    if (pending_out_.size() - pending_sent_ + total - sent > kMaxPendingSendBytes) {
        fprintf(stderr, "binder: dropping peer %d: it does not read (over %zu bytes unsent)\n",
                peer_pid_, kMaxPendingSendBytes);
        send_refused_ = true;
        return false;
    }
    // What the peer has taken goes first, so the queue holds only unsent bytes.
    pending_out_.erase(pending_out_.begin(), pending_out_.begin() + pending_sent_);
    for (PendingDescriptors& pending : pending_descriptors_) pending.at -= pending_sent_;
    pending_sent_ = 0;
    // Bytes sent took the descriptors with them.
    if (sent == 0 && !descriptors.empty()) {
        pending_descriptors_.push_back(
            PendingDescriptors{pending_out_.size(), std::move(descriptors)});
    }
    for (const iovec& part : iov) {
        const uint8_t* bytes = static_cast<const uint8_t*>(part.iov_base);
        const size_t skip = std::min(sent, part.iov_len);
        sent -= skip;
        if (part.iov_len > skip)
            pending_out_.insert(pending_out_.end(), bytes + skip, bytes + part.iov_len);
    }
    if (!flushing_) {
        flushing_ = true;
        std::shared_ptr<Connection> self = shared_from_this();
        TheLooper().RunTask([self] { self->FlushPending(); });
    }
    return true;
}

bool Connection::SendPendingLocked() {
    while (pending_sent_ < pending_out_.size()) {
        // Each frame's descriptors go with its first byte: a send starts there with them, and
        // stops where the next frame with descriptors starts.
        const bool with_descriptors =
            !pending_descriptors_.empty() && pending_descriptors_.front().at == pending_sent_;
        const size_t next = with_descriptors ? 1 : 0;
        const size_t end = pending_descriptors_.size() > next ? pending_descriptors_[next].at
                                                              : pending_out_.size();
        iovec rest{pending_out_.data() + pending_sent_, end - pending_sent_};
        size_t sent = 0;
        if (with_descriptors) {
            if (!SendSome(fd_, &rest, 1, &sent, pending_descriptors_.front().descriptors)) {
                return false;
            }
            if (sent > 0) pending_descriptors_.pop_front();
        } else if (!SendSome(fd_, &rest, 1, &sent)) {
            return false;
        }
        pending_sent_ += sent;
        // The socket is full.
        if (pending_sent_ < end) return true;
    }
    return true;
}

void Connection::FlushPending() {
    while (true) {
        bool alive;
        {
            std::lock_guard<std::mutex> lock(send_mutex_);
            alive = !dead() && SendPendingLocked();
            if (!alive || pending_sent_ == pending_out_.size()) {
                std::vector<uint8_t>().swap(pending_out_);
                pending_descriptors_.clear();
                pending_sent_ = 0;
                flushing_ = false;
                if (alive) return;
            }
        }
        if (!alive) {
            Die();
            return;
        }
        // Until the peer reads, dies, or the runtime shuts down.
        pollfd fds[2] = {{fd_, POLLOUT, 0}, {TheLooper().stop_fd(), POLLIN, 0}};
        if (poll(fds, 2, -1) < 0 && errno != EINTR) return;
        if (fds[1].revents != 0) return;
    }
}

bool Connection::AdmitCall(Incoming* call) {
    return TransactionBuffer::Reserve(FootprintOf(*call->data), (call->flags & FLAG_ONEWAY) != 0,
                                      &call->charge);
}

binder_status_t Connection::Transact(uint64_t target, transaction_code_t code, const AParcel& in,
                                     AParcel* out, binder_flags_t flags) {
    const bool oneway = (flags & FLAG_ONEWAY) != 0;
    // No process's buffer could take it, or no frame could carry it.
    if (in.objects.size() > kMaxObjects || in.fds.size() > kMaxDescriptorsPerFrame ||
        !TransactionBuffer::Fits(FootprintOf(in), oneway)) {
        return STATUS_FAILED_TRANSACTION;
    }
    std::vector<ndk::ScopedFileDescriptor> descriptors;
    if (!DuplicateDescriptors(in.fds, &descriptors)) return STATUS_FAILED_TRANSACTION;
    Waiter waiter;
    std::vector<WireObject> objects;
    uint64_t id;
    // Taken before the call goes out, so that its reply never wakes a runtime thread.
    bool reader = false;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (dead_.load(std::memory_order_relaxed)) return STATUS_DEAD_OBJECT;
        binder_status_t status = EncodeObjectsLocked(in, &objects);
        if (status != STATUS_OK) return status;
        id = next_transaction_id_++;
        // A oneway call waits too, for the receiver to say whether its buffer took the call, as
        // the driver tells a device's sender at once.
        waiters_.emplace_back(id, &waiter);
        reader = !reading_;
        if (reader) TakeReadingRoleLocked();
    }
    uint64_t parent = ScopedCallContext::ParentFor(this);
    if (!Send(FrameType::kTransaction, code, flags, id, target, parent, &in, objects,
              std::move(descriptors))) {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            RemoveWaiterLocked(id);
            if (reader) reading_ = false;
        }
        // The peer is gone: its objects are dead from now on, not only once someone reads.
        Die();
        return STATUS_DEAD_OBJECT;
    }

    UniqueLock lock(mutex_);
    while (!waiter.done) {
        if (!reader) {
            if (!waiter.nested.empty()) {
                // The peer calls back into us while serving our call: serve it on this thread.
                std::shared_ptr<Incoming> call = std::move(waiter.nested.front());
                waiter.nested.erase(waiter.nested.begin());
                lock.unlock();
                Serve(*call);
                call.reset();
                lock.lock();
                continue;
            }
            if (reading_ || dead_.load(std::memory_order_relaxed)) {
                waiter.cv.wait(lock.native());
                continue;
            }
            // Nobody is reading: read for ourselves, sparing a hand-over for our reply.
            TakeReadingRoleLocked();
        }
        reader = false;
        lock.unlock();
        std::shared_ptr<Incoming> call;
        bool alive = ReadAndHandle(true, &call);
        lock.lock();
        reading_ = false;
        if (!alive) {
            lock.unlock();
            Die();
            lock.lock();
            continue;
        }
        RearmLocked();
        // Another caller may be asleep waiting for the role.
        for (auto& entry : waiters_) {
            if (entry.second != &waiter && !entry.second->done) {
                entry.second->cv.notify_one();
                break;
            }
        }
        if (call != nullptr) {
            lock.unlock();
            Dispatch(std::move(call), false);
            lock.lock();
        }
    }
    // The connection died before this caller got to read, and nobody reads it again.
    if (reader) {
        reading_ = false;
        buffer_.Clear();
    }
    RemoveWaiterLocked(id);
    std::vector<std::shared_ptr<Incoming>> dropped = std::move(waiter.nested);
    std::unique_ptr<AParcel> reply = std::move(waiter.reply);
    binder_status_t status = waiter.status;
    lock.unlock();
    dropped.clear();
    if (status == STATUS_OK && reply != nullptr && !oneway) {
        out->data = std::move(reply->data);
        out->objects = std::move(reply->objects);
        out->fds = std::move(reply->fds);
        out->pos = 0;
    }
    return status;
}

bool Connection::HandleReply(Frame& frame) {
    std::unique_ptr<AParcel> reply(new AParcel);
    if (!DecodeParcel(frame, reply.get())) return false;
    std::lock_guard<std::mutex> lock(mutex_);
    Waiter* waiter = FindWaiterLocked(frame.header.transaction_id);
    if (waiter == nullptr) return false;
    waiter->status = static_cast<binder_status_t>(frame.header.code);
    waiter->reply = std::move(reply);
    waiter->done = true;
    waiter->cv.notify_one();
    return true;
}

bool Connection::HandleTransaction(Frame& frame, std::shared_ptr<Incoming>* out) {
    const FrameHeader header = frame.header;
    auto call = std::make_shared<Incoming>();
    call->id = header.transaction_id;
    call->code = header.code;
    call->flags = header.flags;
    call->data.reset(new AParcel);
    if (!DecodeParcel(frame, call->data.get())) return false;
    const bool oneway = (header.flags & FLAG_ONEWAY) != 0;
    if (header.target == kContextObject) {
        if (!oneway) ServeContextCall(*call);
        return true;
    }
    if (!AdmitCall(call.get())) {
        SendReply(call->id, STATUS_FAILED_TRANSACTION, AParcel());
        return true;
    }
    {
        std::lock_guard<std::mutex> lock(mutex_);
        auto it = exports_.find(header.target);
        if (it != exports_.end()) call->target = it->second.binder;
        if (header.parent != 0 && !oneway && call->target.get() != nullptr) {
            Waiter* waiter = FindWaiterLocked(header.parent);
            if (waiter != nullptr) {
                waiter->nested.push_back(std::move(call));
                waiter->cv.notify_one();
                return true;
            }
        }
    }
    if (call->target.get() == nullptr) {
        SendReply(call->id, STATUS_DEAD_OBJECT, AParcel());
        return true;
    }
    if (oneway) {
        // The buffer took it: the sender goes on before it is served.
        SendReply(call->id, STATUS_OK, AParcel());
        // Queued now, while the frames are still taken in order.
        std::shared_ptr<Connection> self = shared_from_this();
        LocalBinder* local = static_cast<LocalBinder*>(call->target.get());
        if (local->QueueOneway([self, call] { self->Serve(*call); })) {
            auto drain = std::make_shared<Incoming>();
            drain->drain_oneway = true;
            drain->target = call->target;
            *out = std::move(drain);
        }
        return true;
    }
    *out = std::move(call);
    return true;
}

void Connection::Dispatch(std::shared_ptr<Incoming> call, bool can_serve) {
    if (call->drain_oneway) {
        ndk::SpAIBinder target = call->target;
        if (can_serve) {
            TheLooper().BeforeServingInline();
            static_cast<LocalBinder*>(target.get())->DrainOneway();
            TheLooper().AfterServingInline();
        } else {
            TheLooper().Enqueue(
                [target] { static_cast<LocalBinder*>(target.get())->DrainOneway(); });
        }
        return;
    }
    if (can_serve) {
        TheLooper().BeforeServingInline();
        Serve(*call);
        TheLooper().AfterServingInline();
        return;
    }
    std::shared_ptr<Connection> self = shared_from_this();
    TheLooper().Enqueue([self, call] { self->Serve(*call); });
}

void Connection::Serve(Incoming& call) {
    // A device gives no sender pid with a oneway call, and a oneway call is nobody's parent: its
    // sender waits for nothing.
    const bool oneway = (call.flags & FLAG_ONEWAY) != 0;
    ScopedCallContext context(peer_uid_, oneway ? 0 : peer_pid_, this, oneway ? 0 : call.id);
    AParcel reply;
    reply.data.reserve(kSmallParcelBytes);
    call.data->pos = 0;
    binder_status_t status =
        call.code == kDumpTransaction
            ? ServeDump(call)
            : call.target.get()->Transact(call.code, call.data.get(), &reply, call.flags);
    call.charge = TransactionBuffer::Charge();
    if (!oneway) SendReply(call.id, status, reply);
}

binder_status_t Connection::ServeDump(Incoming& call) {
    // As for calls: only processes of the registry's owner reach this process at all; root may
    // dump too, as a device's shell may.
    if (peer_uid_ != getuid() && peer_uid_ != 0) return STATUS_PERMISSION_DENIED;
    int received = -1;
    if (AParcel_readParcelFileDescriptor(call.data.get(), &received) != STATUS_OK) {
        return STATUS_BAD_VALUE;
    }
    const ndk::ScopedFileDescriptor out(received);
    std::vector<std::string> args;
    if (out.get() < 0 || !ReadDumpArguments(call.data.get(), &args)) return STATUS_BAD_VALUE;
    std::vector<const char*> argv;
    for (const std::string& arg : args) argv.push_back(arg.c_str());
    // A reader that went away must cost the dump an EPIPE, not the process its life.
    sigset_t pipe_signal;
    sigset_t old_mask;
    sigemptyset(&pipe_signal);
    sigaddset(&pipe_signal, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &pipe_signal, &old_mask);
    const binder_status_t status =
        call.target.get()->Dump(out.get(), argv.data(), static_cast<uint32_t>(argv.size()));
    const timespec no_wait{};
    while (sigtimedwait(&pipe_signal, nullptr, &no_wait) > 0) {
    }
    pthread_sigmask(SIG_SETMASK, &old_mask, nullptr);
    return status;
}

void Connection::ServeContextCall(Incoming& call) {
    AParcel reply;
    binder_status_t status = STATUS_UNKNOWN_TRANSACTION;
    if (call.code == kLookupCode) {
        std::string name;
        status = ndk::AParcel_readString(call.data.get(), &name);
        if (status == STATUS_OK) {
            ndk::SpAIBinder service = ProcessState::Get().FindLocalService(name);
            status = AParcel_writeStrongBinder(&reply, service.get());
        }
    }
    SendReply(call.id, status, reply);
}

void Connection::SendReply(uint64_t id, binder_status_t status, const AParcel& reply) {
    std::vector<WireObject> objects;
    std::vector<ndk::ScopedFileDescriptor> descriptors;
    // The reply goes into the caller's buffer; one that no buffer could take, or no frame could
    // carry, is refused.
    if (status == STATUS_OK &&
        (reply.objects.size() > kMaxObjects || reply.fds.size() > kMaxDescriptorsPerFrame ||
         !TransactionBuffer::Fits(FootprintOf(reply), false) ||
         !DuplicateDescriptors(reply.fds, &descriptors))) {
        status = STATUS_FAILED_TRANSACTION;
    }
    if (status == STATUS_OK) {
        std::lock_guard<std::mutex> lock(mutex_);
        if (dead_.load(std::memory_order_relaxed)) return;
        status = EncodeObjectsLocked(reply, &objects);
    }
    const AParcel* body = status == STATUS_OK ? &reply : nullptr;
    if (status != STATUS_OK) {
        objects.clear();
        descriptors.clear();
    }
    if (!Send(FrameType::kReply, static_cast<uint32_t>(status), 0, id, 0, 0, body, objects,
              std::move(descriptors))) {
        Die();
    }
}

binder_status_t Connection::Lookup(const std::string& name, ndk::SpAIBinder* binder) {
    AParcel request;
    binder_status_t status = ndk::AParcel_writeString(&request, name);
    if (status != STATUS_OK) return status;
    AParcel reply;
    status = Transact(kContextObject, kLookupCode, request, &reply, 0);
    if (status != STATUS_OK) return status;
    return ndk::AParcel_readNullableStrongBinder(&reply, binder);
}

void Connection::Die() {
    auto proxies = std::make_shared<WeakProxies>();
    std::unordered_map<uint64_t, Export> exports;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        // Nobody reads it again: what it buffered goes now, the descriptors of a frame still
        // arriving among it, and not with the last proxy to the peer; also when it died while
        // this thread read it. A thread reading now drops the rest when it gives the role back.
        if (!reading_) buffer_.Clear();
        if (dead_.load(std::memory_order_relaxed)) return;
        dead_.store(true, std::memory_order_release);
        // Calls waiting on the peer fail now, before anyone hears of the death.
        for (auto& entry : waiters_) {
            entry.second->done = true;
            entry.second->status = STATUS_DEAD_OBJECT;
            entry.second->cv.notify_one();
        }
        for (auto& entry : proxies_) {
            entry.second->refs()->IncWeak();
            proxies->refs.push_back(entry.second->refs());
        }
        exports.swap(exports_);
    }
    shutdown(fd_, SHUT_RDWR);
    exports.clear();
    // As on a device, death notices are work for the pool: they wait until a pool thread is
    // free (or exists at all), and never run on a thread that is in a call. A proxy released
    // before then gets none, as its links went with it.
    TheLooper().Enqueue([proxies = std::move(proxies)] {
        for (RefCounts* refs : proxies->refs) {
            AIBinder* proxy = refs->Promote();
            if (proxy != nullptr) {
                static_cast<ProxyBinder*>(proxy)->SendObituaries();
                proxy->DecStrong();
            }
        }
    });
    // Last: once no connection is left, every notice is queued.
    TheLooper().Remove(*this);
}

}  // namespace vyr_binder
