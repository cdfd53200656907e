// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "listener.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <utility>

#include "connection.h"
#include "process_state.h"
#include "registry.h"

namespace vyr_binder {

std::unique_ptr<Listener> Listener::Create(const std::string& dir, const std::string& key) {
    std::string lock_path = Registry::LockPath(dir, key);
    int lock_fd = open(lock_path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    if (lock_fd < 0 || flock(lock_fd, LOCK_EX | LOCK_NB) != 0) {
        fprintf(stderr, "binder: cannot lock %s: %s\n", lock_path.c_str(), strerror(errno));
        if (lock_fd >= 0) close(lock_fd);
        return nullptr;
    }
    std::string path = Registry::SocketPath(dir, key);
    sockaddr_un addr{};
    addr.sun_family = AF_UNIX;
    if (path.size() >= sizeof(addr.sun_path)) {
        close(lock_fd);
        return nullptr;
    }
    std::memcpy(addr.sun_path, path.c_str(), path.size() + 1);
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    unlink(path.c_str());
    if (fd < 0 || bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) != 0 ||
        chmod(path.c_str(), 0600) != 0 || listen(fd, 64) != 0) {
        fprintf(stderr, "binder: cannot listen on %s: %s\n", path.c_str(), strerror(errno));
        if (fd >= 0) close(fd);
        unlink(path.c_str());
        unlink(lock_path.c_str());
        close(lock_fd);
        return nullptr;
    }
    std::unique_ptr<Listener> listener(new Listener(dir, key, fd, lock_fd));
    listener->thread_ = std::thread([l = listener.get()] { l->AcceptLoop(); });
    return listener;
}

Listener::Listener(std::string dir, std::string key, int socket_fd, int lock_fd)
    : dir_(std::move(dir)), key_(std::move(key)), socket_fd_(socket_fd), lock_fd_(lock_fd) {}

Listener::~Listener() {
    Stop();
    close(socket_fd_);
    close(lock_fd_);
}

void Listener::Stop() {
    if (stopped_) return;
    stopped_ = true;
    unlink(Registry::SocketPath(dir_, key_).c_str());
    unlink(Registry::LockPath(dir_, key_).c_str());
    // Wakes accept() with an error.
    shutdown(socket_fd_, SHUT_RDWR);
    if (thread_.joinable()) thread_.join();
}

void Listener::AcceptLoop() {
    for (;;) {
        int fd = accept4(socket_fd_, nullptr, nullptr, SOCK_CLOEXEC);
        if (fd < 0) {
            if (errno == EINTR || errno == ECONNABORTED) continue;
            if (errno == EMFILE || errno == ENFILE || errno == ENOBUFS || errno == ENOMEM) {
                // Out of resources for a moment: let some connections close.
                usleep(10000);
                continue;
            }
            return;
        }
        ucred cred{};
        socklen_t len = sizeof(cred);
        if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &cred, &len) != 0 || cred.uid != geteuid()) {
            close(fd);
            continue;
        }
        auto connection = std::make_shared<Connection>(fd);
        ProcessState::Get().Adopt(connection);
    }
}

}  // namespace vyr_binder
