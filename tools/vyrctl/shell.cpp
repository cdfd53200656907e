// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "shell.h"

#include <unistd.h>

#include <sstream>

#include "connection.h"
#include "event_format.h"
#include "line_reader.h"
#include "options.h"
#include "result_text.h"

namespace vyrctl {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;

namespace {

constexpr size_t kConfigureValues = 11;

std::string Join(const std::vector<std::string>& words) {
    std::string text;
    for (size_t i = 0; i < words.size(); ++i) {
        if (i > 0) text += " ";
        text += words[i];
    }
    return text;
}

}  // namespace

Shell::Shell(std::shared_ptr<IVYRService> service, LineWriter* out, LineWriter* err)
    : service_(std::move(service)), out_(out), err_(err) {}

bool Shell::Execute(const std::string& line) {
    Args words;
    std::istringstream stream(line);
    for (std::string word; stream >> word;) words.push_back(word);
    if (words.empty() || words[0][0] == '#') return true;

    const std::string& command = words[0];
    if (command == "quit" || command == "exit") return false;
    if (command == "open") {
        Open(words);
    } else if (command == "close") {
        Close(words);
    } else if (command == "enable") {
        Enable(words);
    } else if (command == "disable") {
        Disable(words);
    } else if (command == "lowpower") {
        LowPower(words);
    } else if (command == "poll") {
        Poll(words);
    } else if (command == "callback") {
        Callback(words);
    } else if (command == "configure") {
        Configure(words);
    } else if (command == "torch") {
        Torch(words);
    } else if (command == "help") {
        Help();
    } else {
        Error("unknown command '" + command + "' (type 'help' for the list)");
    }
    return true;
}

int Shell::Run(int fd) {
    bool interactive = isatty(fd);
    LineReader reader(fd);
    while (true) {
        if (interactive) out_->Write("vyr> ");
        std::optional<std::string> line = reader.Next();
        if (!line || !Execute(*line)) break;
    }
    if (interactive) out_->Write("\n");
    ReleaseLeftovers();
    return 0;
}

void Shell::ReleaseLeftovers() {
    for (const auto& [handle, client] : open_clients_) {
        err_->WriteLine("releasing handle " + std::to_string(handle) + " left open");
        if (client.enabled) service_->Disable(handle);
        service_->Close(handle);
    }
    open_clients_.clear();
}

bool Shell::ParseNumbers(const Args& args, size_t min_count, size_t max_count, const char* usage,
                         std::vector<int32_t>* numbers) {
    size_t count = args.size() - 1;
    if (count < min_count || count > max_count) {
        Error(std::string("wrong number of arguments; usage: ") + usage);
        return false;
    }
    for (size_t i = 1; i < args.size(); ++i) {
        std::optional<int32_t> value = ParseInt32(args[i]);
        if (!value) {
            Error("'" + args[i] + "' is not a 32-bit whole number; usage: " + usage);
            return false;
        }
        numbers->push_back(*value);
    }
    return true;
}

void Shell::Error(const std::string& message) {
    out_->WriteLine("error: " + message);
}

void Shell::Result(const Args& args, const std::string& outcome) {
    out_->WriteLine(Join(args) + " -> " + outcome);
}

void Shell::Open(const Args& args) {
    if (args.size() != 2) return Error("wrong number of arguments; usage: open MODE");
    std::optional<int32_t> mode = ParseMode(args[1]);
    if (!mode) return Error("'" + args[1] + "' is not a mode (1 or als, 3 or range)");
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->Open(*mode, &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    if (result >= 0) {
        open_clients_[result] = {*mode, false};
        return Result(args, std::to_string(result));
    }
    Result(args, DescribeResult(result));
}

void Shell::Close(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 1, 1, "close HANDLE", &n)) return;
    ndk::ScopedAStatus status = service_->Close(n[0]);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    open_clients_.erase(n[0]);
    Result(args, "ok");
}

void Shell::Enable(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 2, 2, "enable HANDLE PERIOD_MS", &n)) return;
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->Enable(n[0], n[1], &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    auto it = open_clients_.find(n[0]);
    if (result == 0 && it != open_clients_.end()) it->second.enabled = true;
    Result(args, DescribeResult(result));
}

void Shell::Disable(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 1, 1, "disable HANDLE", &n)) return;
    ndk::ScopedAStatus status = service_->Disable(n[0]);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    auto it = open_clients_.find(n[0]);
    if (it != open_clients_.end()) it->second.enabled = false;
    Result(args, "ok");
}

void Shell::LowPower(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 2, 2, "lowpower HANDLE 0|1", &n)) return;
    if (n[1] != 0 && n[1] != 1) return Error("lowpower takes 0 or 1, not " + args[2]);
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->EnableLowPower(n[0], n[1] == 1, &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    Result(args, DescribeResult(result));
}

void Shell::Poll(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 1, 1, "poll HANDLE", &n)) return;
    Event event{};
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->PollOnce(n[0], &event, &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    if (result != 0) return Result(args, DescribeResult(result));
    Result(args, "0 " + FormatEventRaw(event));
}

void Shell::Callback(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 1, 1, "callback HANDLE", &n)) return;
    int32_t handle = n[0];
    Connection::StartThreadPool();
    LineWriter* out = out_;
    auto callback = ndk::SharedRefBase::make<vyr::EventSink>([out, handle](const Event& e) {
        out->WriteLine("event " + std::to_string(handle) + " " + FormatEventRaw(e));
    });
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->SetCallback(handle, callback, &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    if (result == 0) callbacks_.push_back(callback);
    Result(args, DescribeResult(result));
}

void Shell::Configure(const Args& args) {
    std::vector<int32_t> values;
    // Other counts than eleven are passed on: the service's answer to them is worth seeing.
    if (!ParseNumbers(args, 1, 1 + 2 * kConfigureValues, "configure HANDLE V0 ... V10", &values)) {
        return;
    }
    int32_t handle = values[0];
    values.erase(values.begin());
    int32_t result = 0;
    ndk::ScopedAStatus status = service_->ConfigureParameters(handle, values, &result);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    Result(args, DescribeResult(result));
}

void Shell::Torch(const Args& args) {
    std::vector<int32_t> n;
    if (!ParseNumbers(args, 1, 1, "torch STATE", &n)) return;
    ndk::ScopedAStatus status = service_->SetTorchLightState(n[0]);
    if (!status.isOk()) return Result(args, "error: " + DescribeStatus(status));
    Result(args, "ok");
}

void Shell::Help() {
    static const char* const kLines[] = {
        "commands (one result line each: '<command> -> <result>'):",
        "  open MODE               open a handle: 1 or als, 3 or range -> handle or error",
        "  close H                 close a handle",
        "  enable H PERIOD         start sampling every PERIOD ms",
        "  disable H               stop sampling",
        "  lowpower H 0|1          light sensor off between samples (light handles only)",
        "  poll H                  take the latest sample once -> 0 and the event, or -61",
        "  callback H              have events pushed; printed as 'event H ...' lines",
        "  configure H V0 .. V10   send eleven control values (range handles only)",
        "  torch S                 tell the light sensor the camera torch state",
        "  help                    this list",
        "  quit                    leave (handles left open are disabled and closed)",
    };
    for (const char* line : kLines) out_->WriteLine(line);
}

}  // namespace vyrctl
