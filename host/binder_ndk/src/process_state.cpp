// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "process_state.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <random>

#include "connection.h"
#include "listener.h"
#include "registry.h"

namespace vyr_binder {

ProcessState& ProcessState::Get() {
    static ProcessState* state = new ProcessState;
    return *state;
}

std::string ProcessState::key() {
    std::lock_guard<std::mutex> lock(mutex_);
    if (key_.empty()) {
        std::random_device random;
        char buffer[64];
        snprintf(buffer, sizeof(buffer), "p%d-%08x%08x", static_cast<int>(getpid()), random(),
                 random());
        key_ = buffer;
    }
    return key_;
}

ndk::SpAIBinder ProcessState::FindLocalService(const std::string& name) {
    std::lock_guard<std::mutex> lock(services_mutex_);
    auto it = services_.find(name);
    return it == services_.end() ? ndk::SpAIBinder() : it->second;
}

binder_exception_t ProcessState::Publish(const std::string& name, const ndk::SpAIBinder& binder) {
    std::string dir;
    if (!Registry::Dir(&dir)) return EX_ILLEGAL_STATE;
    std::string own_key = key();
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (shutting_down_ || !EnsureListenerLocked(dir)) return EX_ILLEGAL_STATE;
    }
    // Before the name is seen: peers connected already may look it up over their connection.
    may_be_called_.store(true);
    for (const std::shared_ptr<Connection>& connection : looper_.Connections()) {
        connection->WatchInput();
    }
    // Known locally first, so a peer that sees the name can already look it up.
    ndk::SpAIBinder previous;
    {
        std::lock_guard<std::mutex> lock(services_mutex_);
        auto it = services_.find(name);
        if (it != services_.end()) previous = it->second;
        services_[name] = binder;
    }
    binder_exception_t result = Registry::Publish(dir, name, own_key);
    if (result != EX_NONE) {
        std::lock_guard<std::mutex> lock(services_mutex_);
        if (previous.get() != nullptr) {
            services_[name] = previous;
        } else {
            services_.erase(name);
        }
        return result;
    }
    std::lock_guard<std::mutex> lock(mutex_);
    published_.emplace_back(dir, name);
    return EX_NONE;
}

bool ProcessState::EnsureListenerLocked(const std::string& dir) {
    if (listeners_.count(dir) != 0) return true;
    if (key_.empty()) return false;
    std::unique_ptr<Listener> listener = Listener::Create(dir, key_);
    if (listener == nullptr) return false;
    static std::once_flag at_exit_once;
    std::call_once(at_exit_once, [] { atexit(RemoveFilesAtExit); });
    listeners_[dir] = std::move(listener);
    return true;
}

void ProcessState::RemoveFilesAtExit() {
    ProcessState& state = Get();
    // Another thread may hold the lock forever at exit; cleaning up is only a courtesy then.
    if (!state.mutex_.try_lock()) return;
    std::lock_guard<std::mutex> lock(state.mutex_, std::adopt_lock);
    for (const auto& entry : state.published_) {
        Registry::Unpublish(entry.first, entry.second, state.key_);
    }
    for (const auto& entry : state.listeners_) {
        unlink(Registry::SocketPath(entry.first, state.key_).c_str());
        unlink(Registry::LockPath(entry.first, state.key_).c_str());
    }
}

ndk::SpAIBinder ProcessState::Lookup(const std::string& name) {
    ndk::SpAIBinder local = FindLocalService(name);
    if (local.get() != nullptr) return local;
    std::string dir;
    std::string peer_key;
    if (!Registry::Dir(&dir) || !Registry::Resolve(dir, name, &peer_key)) return nullptr;
    if (peer_key == key()) return nullptr;
    std::shared_ptr<Connection> connection = ConnectTo(dir, peer_key);
    if (connection == nullptr) return nullptr;
    ndk::SpAIBinder binder;
    if (connection->Lookup(name, &binder) != STATUS_OK) return nullptr;
    return binder;
}

std::shared_ptr<Connection> ProcessState::LiveConnectionLocked(const std::string& peer_key) {
    auto it = by_key_.find(peer_key);
    if (it == by_key_.end()) return nullptr;
    std::shared_ptr<Connection> existing = it->second.lock();
    return existing != nullptr && !existing->dead() ? existing : nullptr;
}

std::shared_ptr<Connection> ProcessState::ConnectTo(const std::string& dir,
                                                    const std::string& peer_key) {
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (shutting_down_) return nullptr;
        if (std::shared_ptr<Connection> existing = LiveConnectionLocked(peer_key)) return existing;
    }
    std::string path = Registry::SocketPath(dir, peer_key);
    sockaddr_un addr{};
    addr.sun_family = AF_UNIX;
    if (path.size() >= sizeof(addr.sun_path)) return nullptr;
    std::memcpy(addr.sun_path, path.c_str(), path.size() + 1);
    int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return nullptr;
    if (connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof(addr)) != 0) {
        close(fd);
        return nullptr;
    }
    auto connection = std::make_shared<Connection>(fd);
    if (connection->peer_uid() != geteuid()) return nullptr;
    std::string own_key = key();
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (shutting_down_) return nullptr;
        // Another thread connected meanwhile; ours was never used and just closes.
        if (std::shared_ptr<Connection> existing = LiveConnectionLocked(peer_key)) return existing;
        by_key_[peer_key] = connection;
    }
    connection->Start(own_key);
    looper_.Add(connection);
    connection->Watch(may_be_called_.load());
    return connection;
}

void ProcessState::Adopt(const std::shared_ptr<Connection>& connection) {
    std::string own_key = key();
    {
        std::lock_guard<std::mutex> lock(mutex_);
        if (shutting_down_) return;
    }
    connection->Start(own_key);
    looper_.Add(connection);
    // The peer connected to call this process.
    connection->Watch(true);
}

void ProcessState::NamePeer(const std::shared_ptr<Connection>& connection,
                            const std::string& peer_key) {
    std::lock_guard<std::mutex> lock(mutex_);
    for (auto it = by_key_.begin(); it != by_key_.end();) {
        std::shared_ptr<Connection> named = it->second.lock();
        if (named == nullptr || named->dead()) {
            it = by_key_.erase(it);
        } else {
            ++it;
        }
    }
    if (by_key_.count(peer_key) == 0) by_key_[peer_key] = connection;
}

void ProcessState::Shutdown() {
    std::map<std::string, std::unique_ptr<Listener>> listeners;
    std::vector<std::pair<std::string, std::string>> published;
    std::string own_key;
    {
        std::lock_guard<std::mutex> lock(mutex_);
        shutting_down_ = true;
        listeners.swap(listeners_);
        published.swap(published_);
        own_key = key_;
    }
    for (const auto& entry : published) Registry::Unpublish(entry.first, entry.second, own_key);
    for (auto& entry : listeners) entry.second->Stop();
    listeners.clear();
    // Closed connections end through the looper, which delivers their death notices.
    for (const std::shared_ptr<Connection>& connection : looper_.Connections()) {
        connection->Close();
    }
    looper_.WaitForNoConnections();
    looper_.Shutdown();
    std::map<std::string, ndk::SpAIBinder> services;
    {
        std::lock_guard<std::mutex> lock(services_mutex_);
        services.swap(services_);
    }
    services.clear();
    may_be_called_.store(false);
    std::lock_guard<std::mutex> lock(mutex_);
    by_key_.clear();
    key_.clear();
    shutting_down_ = false;
}

}  // namespace vyr_binder

void VyrBinder_shutdown(void) {
    vyr_binder::ProcessState::Get().Shutdown();
}
