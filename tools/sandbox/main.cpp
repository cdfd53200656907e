// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// vyr-sandbox: runs the unmodified service binary with the device paths it expects, backed by
// things the caller controls.
//
//   vyr-sandbox run [--panel STATE] [--apex FILE] [--props FILE] [--no-stdin] [--restart]
//                   -- COMMAND [ARG...]
//   vyr-sandbox panel PID STATE
//
// `run` starts COMMAND in private mount and UTS namespaces in which
//   /sys/class/backlight/panel0-backlight/state  reads the namespace's hostname and wakes poll()
//                                                with POLLPRI|POLLERR whenever it is set;
//   /apex                                        is the directory holding FILE, which must be
//                                                named apex-info-list.xml (empty without --apex);
//   VYR_PROPERTY_FILE                            names the --props file.
// It prints "pid N" once the command runs, then reads commands from stdin, one per line:
//   panel STATE   set the state attribute (answered with "ok" or "error ...")
//   quit          end the command (SIGTERM, SIGKILL after 5 s)
// End of stdin, SIGTERM, SIGINT and SIGHUP end the command too. With --no-stdin, stdin is not
// read (for runs in the background); use `vyr-sandbox panel` and signals instead. When the command
// has ended it prints "exit S" and exits with S: the command's exit code, or 128 + the signal that
// killed it. The command's stdout is sent to stderr so that stdout carries only the lines above.
// Statuses of its own: 77 without the privilege to create namespaces, 125 when setting up fails,
// 127 when COMMAND cannot be run.
//
// With --restart the sandbox starts the command again after each exit, as init does for a
// service that is not oneshot: no sooner than 5 s after its last start. It prints "exit S" for
// each exit and "pid N" for each start, and ends (with the last status) only when asked to:
// SIGTERM, SIGINT, SIGHUP, quit or end of stdin.
//
// `panel` sets the state of the sandbox that contains process PID (the sandbox or its command).
//
// Changing the APEX list: an in-place rewrite (open with O_TRUNC, write) reaches the service's
// inotify watch on the file as IN_MODIFY. A rename over the file also becomes visible under /apex,
// but the watch stays on the replaced inode and sees no further change.

#include <libgen.h>
#include <limits.h>
#include <stdlib.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "supervisor.h"

namespace {

constexpr char kApexListName[] = "apex-info-list.xml";

int Usage() {
    fprintf(stderr,
            "usage: vyr-sandbox run [--panel STATE] [--apex FILE] [--props FILE] [--no-stdin] "
            "[--restart] -- COMMAND [ARG...]\n"
            "       vyr-sandbox panel PID STATE\n");
    return 2;
}

bool ApexDirectoryOf(const char* file, std::string* dir) {
    char resolved[PATH_MAX];
    if (realpath(file, resolved) == nullptr) {
        fprintf(stderr, "vyr-sandbox: --apex %s: %s\n", file, strerror(errno));
        return false;
    }
    if (strcmp(basename(resolved), kApexListName) != 0) {
        fprintf(stderr, "vyr-sandbox: --apex %s: the file must be named %s\n", file, kApexListName);
        return false;
    }
    *dir = dirname(resolved);
    return true;
}

int Run(int argc, char** argv) {
    vyr_sandbox::SandboxOptions options;
    options.panel = "Off";
    int i = 2;
    for (; i < argc && strcmp(argv[i], "--") != 0; i += 2) {
        if (strcmp(argv[i], "--no-stdin") == 0) {
            options.read_stdin = false;
            --i;
            continue;
        }
        if (strcmp(argv[i], "--restart") == 0) {
            options.restart = true;
            --i;
            continue;
        }
        if (i + 1 >= argc) return Usage();
        if (strcmp(argv[i], "--panel") == 0) {
            options.panel = argv[i + 1];
        } else if (strcmp(argv[i], "--apex") == 0) {
            if (!ApexDirectoryOf(argv[i + 1], &options.apex_dir)) return Usage();
        } else if (strcmp(argv[i], "--props") == 0) {
            char resolved[PATH_MAX];
            options.property_file = realpath(argv[i + 1], resolved) ? resolved : argv[i + 1];
        } else {
            return Usage();
        }
    }
    if (i + 1 >= argc) return Usage();
    for (++i; i < argc; ++i) options.command.push_back(argv[i]);
    return vyr_sandbox::Supervisor(std::move(options)).Run();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc >= 2 && strcmp(argv[1], "run") == 0) return Run(argc, argv);
    if (argc == 4 && strcmp(argv[1], "panel") == 0) {
        return vyr_sandbox::SetPanelOf(atoi(argv[2]), argv[3]);
    }
    return Usage();
}
