// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "registry.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace vyr_binder {
namespace {

constexpr size_t kMaxNameBytes = 127;

std::string EntryPath(const std::string& dir, const std::string& name) {
    return dir + "/" + Registry::EntryFileName(name);
}

bool ReadKey(const std::string& entry, std::string* key) {
    char target[256];
    ssize_t n = readlink(entry.c_str(), target, sizeof(target) - 1);
    if (n <= 0) return false;
    key->assign(target, static_cast<size_t>(n));
    return true;
}

// Serialises changes of the registry between processes.
class RegistryLock {
  public:
    explicit RegistryLock(const std::string& dir) {
        fd_ = open((dir + "/.registry.lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
        if (fd_ >= 0) {
            while (flock(fd_, LOCK_EX) != 0 && errno == EINTR) {
            }
        }
    }
    ~RegistryLock() {
        if (fd_ >= 0) close(fd_);
    }
    bool ok() const { return fd_ >= 0; }

  private:
    int fd_;
};

}  // namespace

bool Registry::Dir(std::string* dir) {
    const char* env = getenv("VYR_BINDER_DIR");
    if (env != nullptr && env[0] != '\0') {
        *dir = env;
    } else {
        *dir = "/tmp/vyr-binder-" + std::to_string(geteuid());
    }
    while (dir->size() > 1 && dir->back() == '/') dir->pop_back();
    if (mkdir(dir->c_str(), 0700) != 0 && errno != EEXIST) {
        fprintf(stderr, "binder: cannot create registry %s: %s\n", dir->c_str(), strerror(errno));
        return false;
    }
    struct stat st;
    if (lstat(dir->c_str(), &st) != 0 || !S_ISDIR(st.st_mode) || st.st_uid != geteuid()) {
        fprintf(stderr, "binder: registry %s is not a directory of this user\n", dir->c_str());
        return false;
    }
    // The longest socket path must fit a Unix socket address.
    if (dir->size() + 64 >= sizeof(sockaddr_un::sun_path)) {
        fprintf(stderr, "binder: registry path %s is too long\n", dir->c_str());
        return false;
    }
    return true;
}

std::string Registry::EntryFileName(const std::string& name) {
    // '/' may appear in names but not in file names; '@' may not appear in names.
    std::string file = "svc." + name;
    for (char& c : file) {
        if (c == '/') c = '@';
    }
    return file;
}

bool Registry::IsValidName(const std::string& name) {
    if (name.empty() || name.size() > kMaxNameBytes) return false;
    for (char c : name) {
        bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                  c == '.' || c == '_' || c == '-' || c == '/';
        if (!ok) return false;
    }
    return true;
}

std::string Registry::SocketPath(const std::string& dir, const std::string& key) {
    return dir + "/" + key + ".sock";
}

std::string Registry::LockPath(const std::string& dir, const std::string& key) {
    return dir + "/" + key + ".lock";
}

bool Registry::IsAlive(const std::string& dir, const std::string& key) {
    int fd = open(LockPath(dir, key).c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) return false;
    // The owner holds the lock for its whole life; getting it means the owner is gone.
    bool alive = flock(fd, LOCK_SH | LOCK_NB) != 0 && errno == EWOULDBLOCK;
    close(fd);
    return alive;
}

binder_exception_t Registry::Publish(const std::string& dir, const std::string& name,
                                     const std::string& key) {
    RegistryLock lock(dir);
    if (!lock.ok()) return EX_ILLEGAL_STATE;
    std::string entry = EntryPath(dir, name);
    std::string current;
    if (ReadKey(entry, &current) && current != key) {
        if (IsAlive(dir, current)) {
            // servicemanager overwrites a registration too, and says so in its log.
            fprintf(stderr,
                    "binder: service '%s' originally registered by %s is being registered again "
                    "by %s\n",
                    name.c_str(), current.c_str(), key.c_str());
        } else {
            // Left behind by a process that died without cleaning up.
            unlink(SocketPath(dir, current).c_str());
            unlink(LockPath(dir, current).c_str());
        }
    }
    std::string temp = entry + ".tmp." + key;
    unlink(temp.c_str());
    if (symlink(key.c_str(), temp.c_str()) != 0 || rename(temp.c_str(), entry.c_str()) != 0) {
        fprintf(stderr, "binder: cannot publish %s: %s\n", name.c_str(), strerror(errno));
        unlink(temp.c_str());
        return EX_ILLEGAL_STATE;
    }
    return EX_NONE;
}

void Registry::Unpublish(const std::string& dir, const std::string& name, const std::string& key) {
    RegistryLock lock(dir);
    std::string entry = EntryPath(dir, name);
    std::string current;
    if (ReadKey(entry, &current) && current == key) unlink(entry.c_str());
}

bool Registry::Resolve(const std::string& dir, const std::string& name, std::string* key) {
    return ReadKey(EntryPath(dir, name), key) && IsAlive(dir, *key);
}

}  // namespace vyr_binder
