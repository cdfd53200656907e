// Round trip of a small two-way binder call against a raw Unix-socket ping-pong of the same
// size, and the time from SIGKILL of a peer to its death notice.
//
// The same binary is the peer: "bench_binder --serve <name>" publishes a trivial IVYRService,
// "bench_binder --echo <fd>" answers the raw ping-pong on an inherited socket.
#include <aidl/android/vyr/BnVYRService.h>
#include <aidl/android/vyr/IVYRService.h>
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

bool ReadFull(int fd, char* buffer, size_t size) {
    size_t done = 0;
    while (done < size) {
        ssize_t n = read(fd, buffer + done, size - done);
        if (n <= 0) return false;
        done += static_cast<size_t>(n);
    }
    return true;
}

void BM_RawSocketPingPong(benchmark::State& state) {
    int fds[2];
    socketpair(AF_UNIX, SOCK_STREAM, 0, fds);
    pid_t pid = SpawnSelf({"--echo", std::to_string(fds[1])});
    close(fds[1]);
    char request[kRequestBytes] = {1};
    char reply[kReplyBytes];
    for (auto _ : state) {
        if (write(fds[0], request, sizeof(request)) != static_cast<ssize_t>(sizeof(request)) ||
            !ReadFull(fds[0], reply, sizeof(reply))) {
            state.SkipWithError("echo peer failed");
            break;
        }
    }
    close(fds[0]);
    Reap(pid);
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
    for (auto _ : state) {
        if (!service->Enable(1, 2, &result).isOk()) {
            state.SkipWithError("call failed");
            break;
        }
    }
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

BENCHMARK(BM_RawSocketPingPong)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_BinderRoundTrip)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_DeathNotification)->UseManualTime()->Iterations(20)->Unit(benchmark::kMicrosecond);

// Keeps the mean time of each benchmark to print the ratio at the end.
class RatioReporter : public benchmark::ConsoleReporter {
  public:
    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.iterations > 0) {
                times_[run.benchmark_name()] =
                    run.GetAdjustedRealTime() * 1.0;  // in the benchmark's unit
            }
        }
        ConsoleReporter::ReportRuns(runs);
    }
    // Uses the medians when the benchmarks were repeated.
    void PrintRatio() const {
        const char* suffix = times_.count("BM_RawSocketPingPong_median") != 0 ? "_median" : "";
        auto raw = times_.find(std::string("BM_RawSocketPingPong") + suffix);
        auto binder = times_.find(std::string("BM_BinderRoundTrip") + suffix);
        if (raw == times_.end() || binder == times_.end() || raw->second <= 0) return;
        printf("binder round trip / raw socket ping-pong = %.2f (%.1f us / %.1f us)\n",
               binder->second / raw->second, binder->second, raw->second);
    }

  private:
    std::map<std::string, double> times_;
};

int Serve(const char* name) {
    auto service = ndk::SharedRefBase::make<BenchService>();
    if (AServiceManager_addService(service->asBinder().get(), name) != EX_NONE) return 2;
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
    return 1;
}

int Echo(int fd) {
    char request[kRequestBytes];
    char reply[kReplyBytes] = {2};
    while (ReadFull(fd, request, sizeof(request))) {
        if (write(fd, reply, sizeof(reply)) != static_cast<ssize_t>(sizeof(reply))) break;
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
    if (argc == 3 && strcmp(argv[1], "--echo") == 0) {
        PinPeer();
        return Echo(atoi(argv[2]));
    }

    // A registry of our own, so the benchmark never meets another run's services.
    char templ[] = "/tmp/vyr-binder-bench-XXXXXX";
    const char* dir = mkdtemp(templ);
    if (dir == nullptr) return 1;
    setenv("VYR_BINDER_DIR", dir, 1);

    benchmark::Initialize(&argc, argv);
    RatioReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    reporter.PrintRatio();
    benchmark::Shutdown();
    std::error_code ignored;
    std::filesystem::remove_all(dir, ignored);
    return 0;
}
