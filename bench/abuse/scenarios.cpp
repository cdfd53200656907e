// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "scenarios.h"

#include <signal.h>

#include <chrono>
#include <cstdio>
#include <memory>
#include <mutex>
#include <random>
#include <thread>
#include <vector>

#include "abusive_client.h"
#include "honest_clients.h"
#include "process_stats.h"
#include "raw_peer.h"
#include "service_process.h"

namespace vyr_bench::abuse {
namespace {

using aidl::android::vyr::Event;
using aidl::android::vyr::IVYRService;
using std::chrono::milliseconds;
using std::chrono::steady_clock;
using vyr_test::ServiceProcess;

constexpr milliseconds kStartTimeout{30000};
constexpr milliseconds kStepTimeout{10000};
// The largest frame the runtime accepts, as a header would announce it.
constexpr uint32_t kMaxFrameBytes = 1u << 20;
// IVYRService method index of Close, whose call on a handle that was never opened does nothing.
constexpr uint32_t kCloseIndex = 1;

// The service started from `options`, or null after saying why.
std::shared_ptr<IVYRService> Start(ServiceProcess* process, const Options& options) {
    if (!process->Start(options.service_binary)) {
        fprintf(stderr, "cannot start %s\n", options.service_binary.c_str());
        return nullptr;
    }
    std::shared_ptr<IVYRService> service = process->WaitForService(kStartTimeout);
    if (service == nullptr)
        fprintf(stderr, "the service never registered\n%s", process->Log().c_str());
    return service;
}

// Sanitizer reports and fatal checks in the service's log.
size_t CrashLines(const ServiceProcess& process) {
    return process.LogCount("Check failed") + process.LogCount("Sanitizer") +
           process.LogCount("terminate called");
}

// 0 when the service still runs and its log shows no crash; prints the verdict.
int Verdict(ServiceProcess* process) {
    const bool running = process->Running();
    const size_t crashes = (running ? 0 : 1) + CrashLines(*process);
    printf("crashes: %zu%s\n", crashes, running ? "" : " (the service is gone)");
    return crashes == 0 ? 0 : 1;
}

// One abusive client, killed once it reports `step` and a random while more.
void KillAtStep(const Options& options, const ServiceProcess& process, unsigned seed) {
    std::mt19937 random(seed);
    const int mode = random() % 2 == 0 ? 3 : 1;
    const bool with_callback = random() % 2 == 0;
    std::vector<std::string> steps = {"started", "opened"};
    if (with_callback) steps.push_back("callback");
    steps.push_back("enabled");
    steps.push_back("polling");
    const std::string& step = steps[random() % steps.size()];
    vyr_test::ChildProcess client(
        {options.self, "--client", std::to_string(mode), with_callback ? "callback" : "poll"},
        process.ClientEnvironment(), "/dev/null");
    client.ReadLineStartingWith(step, kStepTimeout);
    std::this_thread::sleep_for(std::chrono::microseconds(random() % 20000));
    client.Signal(SIGKILL);
    client.Wait(kStepTimeout);
}

}  // namespace

int RunSoak(const Options& options) {
    ServiceProcess process;
    std::shared_ptr<IVYRService> service = Start(&process, options);
    if (service == nullptr) return 1;
    const ProcessStats start = ProcessStats::Of(process.pid());
    printf("soak: %d clients killed at random steps, %d honest clients, %d at a time\n",
           options.clients, options.honest, options.parallel);
    printf("service at start: %s\n", start.ToString().c_str());

    const auto began = steady_clock::now();
    {
        HonestClients honest(service, options.honest);
        std::atomic<int> next{0};
        std::vector<std::thread> killers;
        for (int i = 0; i < options.parallel; ++i) {
            killers.emplace_back([&] {
                for (int n = next++; n < options.clients; n = next++) {
                    KillAtStep(options, process, options.seed * 7919u + static_cast<unsigned>(n));
                }
            });
        }
        for (std::thread& killer : killers) killer.join();
        printf("honest calls: %s, %ld failed, %ld opens refused (table full)\n",
               honest.latencies().Summary().c_str(), honest.failed_calls(), honest.full_table());
    }
    printf("clients killed in %.1f s\n",
           std::chrono::duration<double>(steady_clock::now() - began).count());

    // Every client is gone: both sensors must be switched off.
    const bool range_off = process.WaitForSensorState("range.enabled", "0", kStepTimeout);
    const bool als_off = process.WaitForSensorState("als.enabled", "0", kStepTimeout);
    printf("sensors after the last client left: range %s, light %s\n", range_off ? "off" : "ON",
           als_off ? "off" : "ON");
    const ProcessStats end = ProcessStats::Of(process.pid());
    printf("service at end: %s\n", end.ToString().c_str());
    const int verdict = Verdict(&process);
    return verdict == 0 && range_off && als_off ? 0 : 1;
}

int RunHeaders(const Options& options) {
    ServiceProcess process;
    std::shared_ptr<IVYRService> service = Start(&process, options);
    if (service == nullptr) return 1;
    const std::string registry = process.ClientEnvironment().at("VYR_BINDER_DIR");
    printf("headers: %d connections, each announcing a %u-byte frame and sending no more\n",
           options.connections, kMaxFrameBytes);
    printf("service at start: %s\n", ProcessStats::Of(process.pid()).ToString().c_str());
    for (int round = 1; round <= 2; ++round) {
        std::vector<std::unique_ptr<vyr_test::RawPeer>> peers;
        for (int i = 0; i < options.connections; ++i) {
            auto peer = std::make_unique<vyr_test::RawPeer>(registry, "vyrservice");
            if (peer->connected()) peer->SendHeaderOnly(kMaxFrameBytes);
            peers.push_back(std::move(peer));
        }
        // Until the service has read every header (or dropped the connection).
        const auto deadline = steady_clock::now() + kStepTimeout;
        for (const auto& peer : peers) {
            while (peer->connected() && peer->Unread() > 0 && steady_clock::now() < deadline) {
                std::this_thread::sleep_for(milliseconds(1));
            }
        }
        printf("round %d, connections open: %s\n", round,
               ProcessStats::Of(process.pid()).ToString().c_str());
        peers.clear();
        int32_t handle = 0;
        service->Open(3, &handle);
        service->Close(handle);
        printf("round %d, connections closed: %s\n", round,
               ProcessStats::Of(process.pid()).ToString().c_str());
    }
    return Verdict(&process);
}

int RunStalled(const Options& options) {
    ServiceProcess process;
    std::shared_ptr<IVYRService> service = Start(&process, options);
    if (service == nullptr) return 1;
    const std::string registry = process.ClientEnvironment().at("VYR_BINDER_DIR");
    int32_t handle = 0;
    service->Open(3, &handle);
    // A fixed number of timed polls, bounded in time for a service that makes them wait.
    const auto measure = [&](Latencies* latencies) {
        const auto deadline = steady_clock::now() + std::chrono::seconds(60);
        for (int i = 0; i < 300 && steady_clock::now() < deadline; ++i) {
            Event event;
            int32_t result = 0;
            const auto start = steady_clock::now();
            service->PollOnce(handle, &event, &result);
            latencies->Add(steady_clock::now() - start);
            std::this_thread::sleep_for(milliseconds(2));
        }
    };
    Latencies alone;
    measure(&alone);
    printf("stalled: honest PollOnce alone:             %s\n", alone.Summary().c_str());

    vyr_test::RawPeer stalled(registry, "vyrservice");
    const uint64_t target = stalled.LookUp("vyrservice");
    if (target == 0) {
        fprintf(stderr, "the stalled peer cannot find the service\n");
        return 1;
    }
    // Sends calls, never reading a reply, for as long as the service takes them.
    std::atomic<bool> stop{false};
    std::atomic<long> sent{0};
    std::atomic<bool> refused{false};
    std::thread flooder([&] {
        for (uint64_t id = 2; !stop && !stalled.HungUp(); ++id) {
            if (stalled.SendCall(target, id, IVYRService::descriptor, kCloseIndex, {0}, 0, false)) {
                ++sent;
            } else {
                refused = true;
                std::this_thread::sleep_for(milliseconds(1));
            }
        }
    });
    // Until the peer is stalled: its unread replies filled its socket, or the service stopped
    // taking its calls.
    const auto deadline = steady_clock::now() + kStepTimeout;
    while (sent < 2000 && !refused && steady_clock::now() < deadline) {
        std::this_thread::sleep_for(milliseconds(1));
    }
    Latencies beside;
    measure(&beside);
    stop = true;
    flooder.join();
    printf("stalled: honest PollOnce beside a stalled peer: %s (%ld calls sent by it, %s)\n",
           beside.Summary().c_str(), sent.load(),
           stalled.HungUp() ? "dropped by the service" : "still connected");
    printf("stalled: p99 ratio %.2f\n",
           alone.PercentileMicros(99) > 0 ? beside.PercentileMicros(99) / alone.PercentileMicros(99)
                                          : 0.0);
    service->Close(handle);
    return Verdict(&process);
}

}  // namespace vyr_bench::abuse
