// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "fuse_attribute.h"

#include <fcntl.h>
#include <linux/fuse.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

namespace vyr_test::display {
namespace {

constexpr uint64_t kFileNode = 2;
constexpr char kFileName[] = "state";
// The kernel needs room for its largest write request in every read of /dev/fuse.
constexpr size_t kRequestBufferSize = FUSE_MIN_READ_BUFFER + 128 * 1024;

fuse_attr Attributes(uint64_t node, size_t size) {
    fuse_attr attr{};
    attr.ino = node;
    attr.mode = node == FUSE_ROOT_ID ? (S_IFDIR | 0755) : (S_IFREG | 0444);
    attr.nlink = node == FUSE_ROOT_ID ? 2 : 1;
    attr.size = node == FUSE_ROOT_ID ? 0 : size;
    attr.blksize = 4096;
    return attr;
}

}  // namespace

FuseAttribute::FuseAttribute() {
    char dir[] = "/tmp/vyr-display-fuse.XXXXXX";
    if (mkdtemp(dir) == nullptr) {
        problem_ = std::string("cannot create a mount point: ") + strerror(errno);
        return;
    }
    mount_dir_ = dir;
    file_path_ = mount_dir_ + "/" + kFileName;
    fuse_fd_ = open("/dev/fuse", O_RDWR | O_CLOEXEC);
    if (fuse_fd_ < 0) {
        problem_ = std::string("cannot open /dev/fuse: ") + strerror(errno);
        return;
    }
    const std::string options =
        "fd=" + std::to_string(fuse_fd_) + ",rootmode=40000,user_id=0,group_id=0,allow_other";
    if (mount("vyr-display", mount_dir_.c_str(), "fuse", MS_NOSUID | MS_NODEV, options.c_str()) !=
        0) {
        problem_ = std::string("cannot mount a FUSE file system: ") + strerror(errno);
        return;
    }
    stop_fd_ = eventfd(0, EFD_CLOEXEC);
    server_ = std::thread(&FuseAttribute::Serve, this);
}

FuseAttribute::~FuseAttribute() {
    if (server_.joinable()) {
        umount2(mount_dir_.c_str(), MNT_DETACH);
        const uint64_t one = 1;
        (void)!write(stop_fd_, &one, sizeof(one));
        server_.join();
    }
    // Closing the device ends the connection; requests still pending fail.
    if (fuse_fd_ >= 0) close(fuse_fd_);
    if (stop_fd_ >= 0) close(stop_fd_);
    if (!mount_dir_.empty()) rmdir(mount_dir_.c_str());
}

void FuseAttribute::Set(const std::string& content) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        content_ = content;
    }
    Notify();
}

void FuseAttribute::FailReads(int error) {
    std::lock_guard<std::mutex> lock(mutex_);
    read_error_ = error;
}

void FuseAttribute::Notify() {
    std::set<uint64_t> handles;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        ++generation_;
        handles = poll_handles_;
    }
    for (uint64_t handle : handles) {
        struct {
            fuse_out_header header;
            fuse_notify_poll_wakeup_out wakeup;
        } notice{};
        notice.header.len = sizeof(notice);
        notice.header.error = FUSE_NOTIFY_POLL;
        notice.wakeup.kh = handle;
        (void)!write(fuse_fd_, &notice, sizeof(notice));
    }
}

size_t FuseAttribute::opens() {
    std::lock_guard<std::mutex> lock(mutex_);
    return opens_;
}

size_t FuseAttribute::reads() {
    std::lock_guard<std::mutex> lock(mutex_);
    return reads_;
}

bool FuseAttribute::WaitForReads(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return served_.wait_for(lock, timeout, [&] { return reads_ >= count; });
}

bool FuseAttribute::WaitForOpens(size_t count, std::chrono::milliseconds timeout) {
    std::unique_lock<std::mutex> lock(mutex_);
    return served_.wait_for(lock, timeout, [&] { return opens_ >= count; });
}

void FuseAttribute::Serve() {
    std::vector<char> buffer(kRequestBufferSize);
    while (true) {
        pollfd fds[2] = {{fuse_fd_, POLLIN, 0}, {stop_fd_, POLLIN, 0}};
        if (poll(fds, 2, -1) < 0) {
            if (errno == EINTR) continue;
            return;
        }
        if (fds[1].revents != 0) return;
        const ssize_t size = read(fuse_fd_, buffer.data(), buffer.size());
        if (size < 0) {
            // ENOENT: the request was interrupted before it was read.
            if (errno == EINTR || errno == EAGAIN || errno == ENOENT) continue;
            return;
        }
        if (static_cast<size_t>(size) >= sizeof(fuse_in_header)) Handle(buffer.data());
    }
}

void FuseAttribute::Handle(const char* request) {
    const auto* in = reinterpret_cast<const fuse_in_header*>(request);
    const char* body = request + sizeof(fuse_in_header);
    switch (in->opcode) {
        case FUSE_INIT: {
            const auto* init = reinterpret_cast<const fuse_init_in*>(body);
            fuse_init_out out{};
            out.major = FUSE_KERNEL_VERSION;
            out.minor = FUSE_KERNEL_MINOR_VERSION;
            out.max_readahead = init->max_readahead;
            out.max_background = 16;
            out.congestion_threshold = 12;
            out.max_write = 4096;
            out.time_gran = 1;
            return Reply(in->unique, 0, &out, sizeof(out));
        }
        case FUSE_LOOKUP: {
            if (in->nodeid != FUSE_ROOT_ID || strcmp(body, kFileName) != 0) {
                return Reply(in->unique, ENOENT, nullptr, 0);
            }
            fuse_entry_out out{};
            out.nodeid = kFileNode;
            out.generation = 1;
            std::lock_guard<std::mutex> lock(mutex_);
            out.attr = Attributes(kFileNode, content_.size());
            return Reply(in->unique, 0, &out, sizeof(out));
        }
        case FUSE_GETATTR: {
            fuse_attr_out out{};
            std::lock_guard<std::mutex> lock(mutex_);
            out.attr = Attributes(in->nodeid, content_.size());
            return Reply(in->unique, 0, &out, sizeof(out));
        }
        case FUSE_OPEN: {
            fuse_open_out out{};
            // Every read reaches this server, never a cached page.
            out.open_flags = FOPEN_DIRECT_IO;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                out.fh = next_handle_++;
                seen_[out.fh] = generation_;
                ++opens_;
            }
            served_.notify_all();
            return Reply(in->unique, 0, &out, sizeof(out));
        }
        case FUSE_READ: {
            const auto* read_in = reinterpret_cast<const fuse_read_in*>(body);
            std::string data;
            int error;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                error = read_error_;
                if (error == 0 && read_in->offset < content_.size()) {
                    data = content_.substr(read_in->offset, read_in->size);
                }
            }
            Reply(in->unique, error, data.data(), error == 0 ? data.size() : 0);
            {
                std::lock_guard<std::mutex> lock(mutex_);
                ++reads_;
            }
            served_.notify_all();
            return;
        }
        case FUSE_POLL: {
            const auto* poll_in = reinterpret_cast<const fuse_poll_in*>(body);
            fuse_poll_out out{};
            out.revents = POLLIN | POLLRDNORM;
            {
                std::lock_guard<std::mutex> lock(mutex_);
                if (poll_in->flags & FUSE_POLL_SCHEDULE_NOTIFY) poll_handles_.insert(poll_in->kh);
                uint64_t& seen = seen_[poll_in->fh];
                if (seen != generation_) {
                    seen = generation_;
                    out.revents |= POLLERR | POLLPRI;
                }
            }
            return Reply(in->unique, 0, &out, sizeof(out));
        }
        case FUSE_RELEASE: {
            const auto* release = reinterpret_cast<const fuse_release_in*>(body);
            {
                std::lock_guard<std::mutex> lock(mutex_);
                seen_.erase(release->fh);
            }
            return Reply(in->unique, 0, nullptr, 0);
        }
        case FUSE_FLUSH:
        case FUSE_DESTROY:
            return Reply(in->unique, 0, nullptr, 0);
        case FUSE_FORGET:
        case FUSE_BATCH_FORGET:
        case FUSE_INTERRUPT:
            return;
        default:
            return Reply(in->unique, ENOSYS, nullptr, 0);
    }
}

void FuseAttribute::Reply(uint64_t unique, int error, const void* payload, size_t size) {
    fuse_out_header header{};
    header.len = sizeof(header) + size;
    header.error = -error;
    header.unique = unique;
    iovec parts[2] = {{&header, sizeof(header)}, {const_cast<void*>(payload), size}};
    (void)!writev(fuse_fd_, parts, size > 0 ? 2 : 1);
}

}  // namespace vyr_test::display
