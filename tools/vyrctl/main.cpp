// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// vyrctl: command-line client of vyrservice.

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <string>
#include <vector>

#include "connection.h"
#include "demo_view.h"
#include "line_writer.h"
#include "one_shot_commands.h"
#include "options.h"
#include "ring_command.h"
#include "shell.h"
#include "stop_signal.h"
#include "stream_command.h"

using namespace vyrctl;

namespace {

constexpr int kUsageError = 2;

int UsageError(LineWriter* err, const std::string& message) {
    err->WriteLine("vyrctl: " + message);
    err->WriteLine("run 'vyrctl help' for usage");
    return kUsageError;
}

// Parses every argument as a 32-bit number; false (message printed) on the first bad one.
bool ParseAll(const std::vector<std::string>& args, std::vector<int32_t>* values, LineWriter* err) {
    for (const std::string& arg : args) {
        std::optional<int32_t> value = ParseInt32(arg);
        if (!value) {
            err->WriteLine("vyrctl: '" + arg + "' is not a 32-bit whole number");
            return false;
        }
        values->push_back(*value);
    }
    return true;
}

}  // namespace

int main(int argc, char** argv) {
    LineWriter out(stdout);
    LineWriter err(stderr);
    GlobalOptions global;
    std::string error;
    if (!ParseGlobalOptions(std::vector<std::string>(argv + 1, argv + argc), &global, &error)) {
        return UsageError(&err, error);
    }
    const std::string& command = global.command;
    if (command == "help" || command == "--help" || command == "-h") {
        out.Write(UsageText());
        return 0;
    }

    // Check the arguments before waiting for the service, so that typos fail at once.
    StreamOptions stream;
    RingOptions ring;
    DemoViewOptions demo;
    std::vector<int32_t> values;
    if (command == "stream") {
        if (!ParseStreamOptions(global.args, &stream, &error)) return UsageError(&err, error);
    } else if (command == "ring") {
        if (!ParseRingOptions(global.args, &ring, &error)) return UsageError(&err, error);
    } else if (command == "demo-view") {
        if (!ParseDemoViewOptions(global.args, &demo, &error)) return UsageError(&err, error);
    } else if (command == "configure") {
        if (global.args.size() != 11) {
            return UsageError(&err, "configure needs exactly 11 values, got " +
                                        std::to_string(global.args.size()));
        }
        if (!ParseAll(global.args, &values, &err)) return kUsageError;
    } else if (command == "torch") {
        if (global.args.size() != 1) return UsageError(&err, "torch needs one value: STATE");
        if (!ParseAll(global.args, &values, &err)) return kUsageError;
    } else if (command == "dump") {
        if (global.args.size() > 1 || (global.args.size() == 1 && global.args[0] != "--json")) {
            return UsageError(&err, "dump takes only --json");
        }
    } else if (command == "shell" || command == "wait") {
        if (!global.args.empty()) return UsageError(&err, command + " takes no arguments");
    } else {
        return UsageError(&err, "unknown command '" + command + "'");
    }

    StopSignal::Install();
    auto timeout = std::chrono::milliseconds(static_cast<int64_t>(global.timeout_s * 1000));
    std::unique_ptr<Connection> connection = Connection::Open(timeout, &err);
    if (connection == nullptr) return 1;

    if (command == "wait") {
        out.WriteLine("vyrservice is registered");
        return 0;
    }
    if (command == "stream") return RunStream(*connection, stream, &out, &err);
    if (command == "ring") return RunRing(*connection, ring, &out, &err);
    if (command == "demo-view") return RunDemoView(*connection, demo, &out, &err);
    if (command == "configure") return RunConfigure(*connection, values, &out, &err);
    if (command == "torch") return RunTorch(*connection, values[0], &out, &err);
    if (command == "dump") return RunDump(*connection, global.args, &err);
    return Shell(connection->service(), &out, &err).Run(STDIN_FILENO);
}
