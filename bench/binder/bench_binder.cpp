// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Round trip of a small two-way binder call against a raw Unix-socket ping-pong of the same
// size, and the time from SIGKILL of a peer to its death notice; the context switches of both
// processes per round trip come with each. With VYR_BENCH_SERVICE set to the pid of a running
// vyrservice (of VYR_BINDER_DIR), it measures PollOnce on that service instead, against the raw
// ping-pong of PollOnce's sizes.
//
// The same binary is the peer: "bench_binder --serve <name>" publishes a trivial IVYRService,
// "bench_binder --echo <fd> <request bytes> <reply bytes>" answers the raw ping-pong on an
// inherited socket.
#include <aidl/android/vyr/BnVYRService.h>
#include <aidl/android/vyr/IVYRService.h>
#include <android-base/file.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <benchmark/benchmark.h>
#include <sched.h>
#include <signal.h>
#include <spawn.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vyr/binder_host.h>

#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

extern char** environ;

namespace {

using aidl::android::vyr::BnVYRService;
using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;
using aidl::android::vyr::IVYRService;

// Bytes on the wire of one Enable(handle, period) call and of its reply, frame headers included:
// the call carries the interface token (marker, length, "android.vyr.IVYRService" padded to 24)
// and two int32 arguments; the reply a status and one int32.
constexpr size_t kRequestBytes = 56 + 40;
constexpr size_t kReplyBytes = 56 + 8;
// PollOnce(handle): the token and one int32; the reply a status, an Event without a new sample
// (what nearly every poll at this rate gets) and the result.
constexpr size_t kPollRequestBytes = 56 + 36;
constexpr size_t kPollReplyBytes = 56 + 40;
constexpr size_t kMaxRawBytes = 512;
constexpr int32_t kRangeMode = 3;

class BenchService : public BnVYRService {
  public:
    ndk::ScopedAStatus Open(int32_t mode, int32_t* r) override { return Set(r, mode); }
    ndk::ScopedAStatus Close(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus Enable(int32_t handle, int32_t period, int32_t* r) override {
        return Set(r, handle + period);
    }
    ndk::ScopedAStatus Disable(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus SetCallback(int32_t, const std::shared_ptr<IEventCallback>&,
                                   int32_t* r) override {
        return Set(r, 0);
    }
    ndk::ScopedAStatus EnableLowPower(int32_t, bool, int32_t* r) override { return Set(r, 0); }
    ndk::ScopedAStatus PollOnce(int32_t, Event*, int32_t* r) override { return Set(r, 0); }
    ndk::ScopedAStatus ConfigureParameters(int32_t, const std::vector<int32_t>&,
                                           int32_t* r) override {
        return Set(r, 0);
    }
    ndk::ScopedAStatus SetTorchLightState(int32_t) override { return ndk::ScopedAStatus::ok(); }
    ndk::ScopedAStatus EnableOnSample(int32_t handle, int32_t period, int32_t, int32_t* r) override {
        return Set(r, handle + period);
    }
    ndk::ScopedAStatus Flush(int32_t, int32_t* r) override { return Set(r, 0); }
    ndk::ScopedAStatus EnableRing(int32_t, int32_t, ndk::ScopedFileDescriptor*,
                                  int32_t* r) override {
        return Set(r, -38);
    }

  private:
    static ndk::ScopedAStatus Set(int32_t* r, int32_t value) {
        *r = value;
        return ndk::ScopedAStatus::ok();
    }
};

pid_t SpawnSelf(const std::vector<std::string>& args) {
    std::vector<std::string> all = {"/proc/self/exe"};
    all.insert(all.end(), args.begin(), args.end());
    std::vector<char*> argv;
    for (std::string& arg : all) argv.push_back(arg.data());
    argv.push_back(nullptr);
    pid_t pid = -1;
    if (posix_spawn(&pid, "/proc/self/exe", nullptr, nullptr, argv.data(), environ) != 0) {
        return -1;
    }
    return pid;
}

void Reap(pid_t pid) {
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
}

ndk::SpAIBinder WaitForService(const char* name) {
    for (int i = 0; i < 1000; ++i) {
        ndk::SpAIBinder binder(AServiceManager_checkService(name));
        if (binder.get() != nullptr) return binder;
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return ndk::SpAIBinder();
}

// Context switches, voluntary or not, of all threads of `pid` so far.
double Switches(pid_t pid) {
    double total = 0;
    std::error_code ignored;
    const std::string tasks = "/proc/" + std::to_string(pid) + "/task";
    for (const auto& task : std::filesystem::directory_iterator(tasks, ignored)) {
        FILE* status = fopen((task.path() / "status").c_str(), "r");
        if (status == nullptr) continue;
        char line[256];
        unsigned long count;
        while (fgets(line, sizeof(line), status) != nullptr) {
            if (sscanf(line, "voluntary_ctxt_switches: %lu", &count) == 1 ||
                sscanf(line, "nonvoluntary_ctxt_switches: %lu", &count) == 1) {
                total += static_cast<double>(count);
            }
        }
        fclose(status);
    }
    return total;
}

// Counts the context switches of this process and of `peer` over the timed loop, per iteration.
class SwitchCounter {
  public:
    SwitchCounter(benchmark::State& state, pid_t peer)
        : state_(state), peer_(peer), start_(Switches(getpid()) + Switches(peer)) {}
    // While the peer still runs.
    void Report() {
        if (state_.iterations() == 0) return;
        state_.counters["switches"] = benchmark::Counter(
            Switches(getpid()) + Switches(peer_) - start_, benchmark::Counter::kAvgIterations);
    }

  private:
    benchmark::State& state_;
    const pid_t peer_;
    const double start_;
};

// Arguments: request and reply bytes.
void BM_RawSocketPingPong(benchmark::State& state) {
    const size_t request_bytes = static_cast<size_t>(state.range(0));
    const size_t reply_bytes = static_cast<size_t>(state.range(1));
    int fds[2];
    socketpair(AF_UNIX, SOCK_STREAM, 0, fds);
    pid_t pid = SpawnSelf({"--echo", std::to_string(fds[1]), std::to_string(request_bytes),
                           std::to_string(reply_bytes)});
    close(fds[1]);
    char request[kMaxRawBytes] = {1};
    char reply[kMaxRawBytes];
    SwitchCounter switches(state, pid);
    for (auto _ : state) {
        if (write(fds[0], request, request_bytes) != static_cast<ssize_t>(request_bytes) ||
            !android::base::ReadFully(fds[0], reply, reply_bytes)) {
            state.SkipWithError("echo peer failed");
            break;
        }
    }
    switches.Report();
    close(fds[0]);
    Reap(pid);
}

// PollOnce of an enabled range handle on the running service.
void BM_PollOnce(benchmark::State& state) {
    std::shared_ptr<IVYRService> service = IVYRService::fromBinder(WaitForService("vyrservice"));
    int32_t handle = -1;
    int32_t result = -1;
    if (service == nullptr || !service->Open(kRangeMode, &handle).isOk() || handle < 0 ||
        !service->Enable(handle, 10, &result).isOk() || result != 0) {
        state.SkipWithError("vyrservice did not open and enable a range handle");
        return;
    }
    Event event;
    const char* service_pid = getenv("VYR_BENCH_SERVICE");
    SwitchCounter switches(state, atoi(service_pid != nullptr ? service_pid : "0"));
    for (auto _ : state) {
        if (!service->PollOnce(handle, &event, &result).isOk()) {
            state.SkipWithError("call failed");
            break;
        }
    }
    switches.Report();
    service->Disable(handle);
    service->Close(handle);
}

void BM_BinderRoundTrip(benchmark::State& state) {
    pid_t pid = SpawnSelf({"--serve", "bench.roundtrip"});
    std::shared_ptr<IVYRService> service =
        IVYRService::fromBinder(WaitForService("bench.roundtrip"));
    if (service == nullptr) {
        state.SkipWithError("service did not start");
        Reap(pid);
        return;
    }
    int32_t result = 0;
    SwitchCounter switches(state, pid);
    for (auto _ : state) {
        if (!service->Enable(1, 2, &result).isOk()) {
            state.SkipWithError("call failed");
            break;
        }
    }
    switches.Report();
    service.reset();
    Reap(pid);
    VyrBinder_shutdown();
}

std::mutex g_death_mutex;
std::condition_variable g_death_cv;
bool g_died = false;

void OnDied(void*) {
    std::lock_guard<std::mutex> lock(g_death_mutex);
    g_died = true;
    g_death_cv.notify_all();
}

void BM_DeathNotification(benchmark::State& state) {
    ABinderProcess_startThreadPool();
    ndk::ScopedAIBinder_DeathRecipient recipient(AIBinder_DeathRecipient_new(OnDied));
    for (auto _ : state) {
        pid_t pid = SpawnSelf({"--serve", "bench.death"});
        ndk::SpAIBinder binder = WaitForService("bench.death");
        if (binder.get() == nullptr ||
            AIBinder_linkToDeath(binder.get(), recipient.get(), nullptr) != STATUS_OK) {
            state.SkipWithError("service did not start");
            Reap(pid);
            break;
        }
        {
            std::lock_guard<std::mutex> lock(g_death_mutex);
            g_died = false;
        }
        auto start = std::chrono::steady_clock::now();
        kill(pid, SIGKILL);
        std::unique_lock<std::mutex> lock(g_death_mutex);
        g_death_cv.wait(lock, [] { return g_died; });
        auto end = std::chrono::steady_clock::now();
        lock.unlock();
        state.SetIterationTime(std::chrono::duration<double>(end - start).count());
        waitpid(pid, nullptr, 0);
        binder.set(nullptr);
        VyrBinder_shutdown();
        ABinderProcess_startThreadPool();
    }
}

void RegisterBenchmarks(bool against_service) {
    if (against_service) {
        benchmark::RegisterBenchmark("BM_RawSocketPingPong", BM_RawSocketPingPong)
            ->Args({kPollRequestBytes, kPollReplyBytes})
            ->Unit(benchmark::kMicrosecond);
        benchmark::RegisterBenchmark("BM_PollOnce", BM_PollOnce)->Unit(benchmark::kMicrosecond);
        return;
    }
    benchmark::RegisterBenchmark("BM_RawSocketPingPong", BM_RawSocketPingPong)
        ->Args({kRequestBytes, kReplyBytes})
        ->Unit(benchmark::kMicrosecond);
    benchmark::RegisterBenchmark("BM_BinderRoundTrip", BM_BinderRoundTrip)
        ->Unit(benchmark::kMicrosecond);
    benchmark::RegisterBenchmark("BM_DeathNotification", BM_DeathNotification)
        ->UseManualTime()
        ->Iterations(20)
        ->Unit(benchmark::kMicrosecond);
}

// Keeps the time of each benchmark, by name without its arguments, to print the ratio at the
// end.
class RatioReporter : public benchmark::ConsoleReporter {
  public:
    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.iterations > 0) {
                const std::string name = run.run_name.function_name + Suffix(run);
                times_[name] = run.GetAdjustedRealTime();
                auto switches = run.counters.find("switches");
                if (switches != run.counters.end()) switches_[name] = switches->second.value;
            }
        }
        ConsoleReporter::ReportRuns(runs);
    }
    // Uses the medians when the benchmarks were repeated.
    void PrintRatio(const char* measured, const char* what) {
        const char* suffix = times_.count("BM_RawSocketPingPong_median") != 0 ? "_median" : "";
        auto raw = times_.find(std::string("BM_RawSocketPingPong") + suffix);
        auto call = times_.find(std::string(measured) + suffix);
        if (raw == times_.end() || call == times_.end() || raw->second <= 0) return;
        printf("%s / raw socket ping-pong = %.2f (%.1f us / %.1f us, %.2f / %.2f switches)\n", what,
               call->second / raw->second, call->second, raw->second, switches_[call->first],
               switches_[raw->first]);
    }

  private:
    static std::string Suffix(const Run& run) {
        return run.aggregate_name.empty() ? "" : "_" + run.aggregate_name;
    }
    std::map<std::string, double> times_;
    std::map<std::string, double> switches_;
};

int Serve(const char* name) {
    auto service = ndk::SharedRefBase::make<BenchService>();
    if (AServiceManager_addService(service->asBinder().get(), name) != EX_NONE) return 2;
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
    return 1;
}

int Echo(int fd, size_t request_bytes, size_t reply_bytes) {
    if (request_bytes > kMaxRawBytes || reply_bytes > kMaxRawBytes) return 2;
    char request[kMaxRawBytes];
    char reply[kMaxRawBytes] = {2};
    while (android::base::ReadFully(fd, request, request_bytes)) {
        if (write(fd, reply, reply_bytes) != static_cast<ssize_t>(reply_bytes)) break;
    }
    return 0;
}

}  // namespace

// With VYR_BENCH_PEER_CPU set, the peer runs on that CPU alone: bench/run places the two
// processes on one CPU or on two.
void PinPeer() {
    const char* cpu = getenv("VYR_BENCH_PEER_CPU");
    if (cpu == nullptr) return;
    cpu_set_t set;
    CPU_ZERO(&set);
    CPU_SET(atoi(cpu), &set);
    sched_setaffinity(0, sizeof(set), &set);
}

int main(int argc, char** argv) {
    if (argc == 3 && strcmp(argv[1], "--serve") == 0) {
        PinPeer();
        return Serve(argv[2]);
    }
    if (argc == 5 && strcmp(argv[1], "--echo") == 0) {
        PinPeer();
        return Echo(atoi(argv[2]), strtoul(argv[3], nullptr, 10), strtoul(argv[4], nullptr, 10));
    }

    const bool against_service = getenv("VYR_BENCH_SERVICE") != nullptr;
    // Otherwise a registry of our own, so the benchmark never meets another run's services.
    char templ[] = "/tmp/vyr-binder-bench-XXXXXX";
    const char* dir = nullptr;
    if (!against_service) {
        dir = mkdtemp(templ);
        if (dir == nullptr) return 1;
        setenv("VYR_BINDER_DIR", dir, 1);
    }

    benchmark::Initialize(&argc, argv);
    RegisterBenchmarks(against_service);
    RatioReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    if (against_service) {
        reporter.PrintRatio("BM_PollOnce", "PollOnce on vyrservice");
    } else {
        reporter.PrintRatio("BM_BinderRoundTrip", "binder round trip");
    }
    benchmark::Shutdown();
    if (dir != nullptr) {
        std::error_code ignored;
        std::filesystem::remove_all(dir, ignored);
    }
    return 0;
}
