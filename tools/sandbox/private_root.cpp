// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "private_root.h"

#include <dirent.h>
#include <fcntl.h>
#include <limits.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

namespace vyr_sandbox {
namespace {

constexpr char kBacklightDir[] = "/sys/class/backlight";
constexpr char kPanelDir[] = "/sys/class/backlight/panel0-backlight";
constexpr char kStateFile[] = "/sys/class/backlight/panel0-backlight/state";
// The kernel's hostname attribute notifies pollers with POLLPRI|POLLERR on every sethostname(),
// exactly like a sysfs attribute on sysfs_notify(), and reads back this namespace's hostname.
constexpr char kHostnameAttribute[] = "/proc/sys/kernel/hostname";

std::string Failure(const std::string& what, const std::string& path) {
    return what + " " + path + ": " + strerror(errno);
}

std::vector<std::string> ListDirectory(const std::string& path) {
    std::vector<std::string> names;
    DIR* dir = opendir(path.c_str());
    if (dir == nullptr) return names;
    while (dirent* entry = readdir(dir)) {
        std::string name = entry->d_name;
        if (name != "." && name != "..") names.push_back(name);
    }
    closedir(dir);
    return names;
}

// Makes `target` show what `source` shows: directories and files are bound (with everything
// mounted below them), symbolic links are copied.
std::string Mirror(const std::string& source, const std::string& target) {
    struct stat st;
    if (lstat(source.c_str(), &st) != 0) return Failure("cannot stat", source);
    if (S_ISLNK(st.st_mode)) {
        char link[PATH_MAX];
        ssize_t length = readlink(source.c_str(), link, sizeof(link) - 1);
        if (length < 0) return Failure("cannot read link", source);
        link[length] = '\0';
        if (symlink(link, target.c_str()) != 0) return Failure("cannot create link", target);
        return "";
    }
    if (S_ISDIR(st.st_mode)) {
        if (mkdir(target.c_str(), 0755) != 0) return Failure("cannot create", target);
    } else if (S_ISREG(st.st_mode)) {
        int fd = open(target.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
        if (fd < 0) return Failure("cannot create", target);
        close(fd);
    } else {
        return "";
    }
    if (mount(source.c_str(), target.c_str(), nullptr, MS_BIND | MS_REC, nullptr) != 0) {
        return Failure("cannot bind " + source + " onto", target);
    }
    return "";
}

std::string MountTmpfs(const std::string& target) {
    if (mount("tmpfs", target.c_str(), "tmpfs", MS_NOSUID | MS_NODEV, "mode=0755") != 0) {
        return Failure("cannot mount a tmpfs on", target);
    }
    return "";
}

}  // namespace

std::string PrivateRoot::Enter() {
    if (mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
        return Failure("cannot make mounts private under", "/");
    }
    char root_template[] = "/tmp/vyr-sandbox.XXXXXX";
    if (mkdtemp(root_template) == nullptr) return Failure("cannot create", root_template);
    const std::string new_root = root_template;
    std::string error = MountTmpfs(new_root);
    if (error.empty()) error = BindHostTopLevel(new_root);
    if (error.empty()) error = OverlayBacklight(new_root);
    if (error.empty()) error = SwitchRoot(new_root);
    // The directory only served as a mount point inside this namespace.
    if (!error.empty()) umount2(root_template, MNT_DETACH);
    rmdir(root_template);
    return error;
}

std::string PrivateRoot::BindHostTopLevel(const std::string& new_root) {
    for (const std::string& name : ListDirectory("/")) {
        if (name == "apex") continue;
        std::string error = Mirror("/" + name, new_root + "/" + name);
        if (!error.empty()) return error;
    }
    // Binding /tmp copied the new root's own mount into itself; drop that copy.
    umount2((new_root + new_root).c_str(), MNT_DETACH);

    const std::string apex = new_root + "/apex";
    if (mkdir(apex.c_str(), 0755) != 0) return Failure("cannot create", apex);
    if (!apex_dir_.empty() &&
        mount(apex_dir_.c_str(), apex.c_str(), nullptr, MS_BIND, nullptr) != 0) {
        return Failure("cannot bind " + apex_dir_ + " onto", apex);
    }
    return "";
}

std::string PrivateRoot::OverlayBacklight(const std::string& new_root) {
    struct stat st;
    if (stat(kBacklightDir, &st) == 0) {
        std::string error = MountTmpfs(new_root + kBacklightDir);
        if (!error.empty()) return error;
    } else {
        // sysfs has no backlight class here and refuses mkdir: replace the class directory by a
        // tmpfs that shows every other class again and a backlight class of our own.
        const std::string classes = new_root + "/sys/class";
        std::string error = MountTmpfs(classes);
        if (!error.empty()) return error;
        for (const std::string& name : ListDirectory("/sys/class")) {
            error = Mirror("/sys/class/" + name, classes + "/" + name);
            if (!error.empty()) return error;
        }
        const std::string backlight = new_root + kBacklightDir;
        if (mkdir(backlight.c_str(), 0755) != 0) return Failure("cannot create", backlight);
    }
    const std::string panel = new_root + kPanelDir;
    if (mkdir(panel.c_str(), 0755) != 0) return Failure("cannot create", panel);
    return Mirror(kHostnameAttribute, new_root + kStateFile);
}

std::string PrivateRoot::SwitchRoot(const std::string& new_root) {
    char cwd[PATH_MAX];
    if (getcwd(cwd, sizeof(cwd)) == nullptr) strcpy(cwd, "/");
    if (mount(nullptr, new_root.c_str(), nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) {
        return Failure("cannot make mounts private under", new_root);
    }
    if (chdir(new_root.c_str()) != 0) return Failure("cannot enter", new_root);
    // Stacking the old root under the new one and detaching it leaves only the new root visible.
    if (syscall(SYS_pivot_root, ".", ".") != 0) return Failure("cannot pivot to", new_root);
    if (umount2(".", MNT_DETACH) != 0) return Failure("cannot detach the old root from", "/");
    if (chdir(cwd) != 0 && chdir("/") != 0) return Failure("cannot enter", "/");
    return "";
}

}  // namespace vyr_sandbox
