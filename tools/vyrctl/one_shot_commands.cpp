// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "one_shot_commands.h"

#include <android/binder_ibinder.h>
#include <unistd.h>

#include <cstdio>

#include "call_check.h"
#include "options.h"
#include "result_text.h"

namespace vyrctl {

int RunConfigure(const Connection& connection, const std::vector<int32_t>& values, LineWriter* out,
                 LineWriter* err) {
    const auto& service = connection.service();
    int32_t handle = 0;
    ndk::ScopedAStatus status = service->Open(kModeRange, &handle);
    if (!CheckCall(status, handle, "open range", err)) return 1;
    int32_t result = 0;
    status = service->ConfigureParameters(handle, values, &result);
    service->Close(handle);
    if (!status.isOk()) {
        err->WriteLine("error: configure: " + DescribeStatus(status));
        return 1;
    }
    out->WriteLine("configure -> " + DescribeResult(result));
    return result == 0 ? 0 : 1;
}

int RunTorch(const Connection& connection, int32_t state, LineWriter* out, LineWriter* err) {
    ndk::ScopedAStatus status = connection.service()->SetTorchLightState(state);
    if (!status.isOk()) {
        err->WriteLine("error: torch: " + DescribeStatus(status));
        return 1;
    }
    out->WriteLine("torch " + std::to_string(state) + " -> ok");
    return 0;
}

int RunDump(const Connection& connection, const std::vector<std::string>& args, LineWriter* err) {
    std::vector<const char*> argv;
    for (const std::string& arg : args) argv.push_back(arg.c_str());
    fflush(stdout);
    const binder_status_t status =
        AIBinder_dump(connection.service()->asBinder().get(), STDOUT_FILENO, argv.data(),
                      static_cast<uint32_t>(argv.size()));
    if (status != STATUS_OK) {
        err->WriteLine("error: dump: " + DescribeStatus(ndk::ScopedAStatus::fromStatus(status)));
        return 1;
    }
    return 0;
}

}  // namespace vyrctl
