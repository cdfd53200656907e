// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/BnVYRService.h>
#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>
#include <sys/types.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <unordered_map>
#include <vector>

#include "ambient_light_sensor.h"
#include "api_lock.h"
#include "client_entry.h"
#include "client_process_watcher.h"
#include "deferred_join.h"
#include "dump_value.h"
#include "event_delivery.h"
#include "event_ring.h"
#include "service_config.h"
#include "service_mode_params.h"
#include "ubk/range_sensor.h"
#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

// Threads and locks. "a -> b": b may be taken while a is held, never the other way; locks not
// joined by an arrow are never held together.
// - binder pool (the IVYRService methods, dump and death notices; vyrservice.cpp,
//   vyrservice_dump.cpp): api_lock_ -> a WorkQueue mutex, a client's notify_mutex, a SampleQueue's
//   mutex, or a block's data_mutex -> a SampleQueue's mutex; links_mutex_ alone. Joins a version 1
//   notification thread under api_lock_, a version 2 delivery thread after it (DeferredJoin).
// - worker 0 and 1 (WorkLoop, vyrservice.cpp): its sensor lock; a block's shown_mutex. Waits for
//   the sensor libraries and joins the mode's processing thread.
// - processing, one per enabled mode (ProcessLoop, vyrservice.cpp): data_mutex -> a
//   SampleQueue's mutex; wait_mutex alone. Waits for the sensor library's read and on wait_cv.
// - notification, version 1 (NotifyLoop, event_delivery.cpp): data_mutex; notify_mutex. Waits
//   for the client's OnEvent.
// - delivery, version 2 (SampleLoop, event_delivery.cpp): its SampleQueue's mutex; data_mutex.
//   Waits for the client's OnEvent, OnEventBatch and OnFlushComplete.
// - display monitor (MonitorDisplayStatus, vyrservice.cpp): a WorkQueue mutex; display_mutex_.
//   Waits in poll on the backlight attribute.
// - process watcher (ClientProcessWatcher, client_process_watcher.cpp): its own mutex; api_lock_
//   through HandleClientProcessExit. Waits on the pidfds of client processes.
// Only the binder pool and the process watcher take api_lock_, so a thread joined under it never
// waits for it, but through a client's nested call (below).

// Shares the range sensor (mode 3) and the spectral ambient-light sensor (mode 1) between
// clients. Every binder method and the death handler run wholly under `api_lock_`; sensors are
// switched only by the two workers, and sampled only by the per-mode processing threads.
//
// Delivery threads and the API lock: a version 1 client's notification thread (Enable) is joined
// under the lock by Disable and Close, so a callback of such a client that waits for the service
// while another of its threads disables it ends the service through the lock check. A version 2
// client's delivery thread (EnableOnSample) never is: Disable and Close stop it under the lock
// and hand it to a DeferredJoin, which joins it after the lock is released and before the method
// returns (a new enable may start its successor meanwhile); a dead client's thread is joined by
// FinishRelease, also after the lock. Such a callback holds up only the call that stops it.
class VYRService : public aidl::android::vyr::BnVYRService {
  public:
    explicit VYRService(const ServiceConfig& config);
    ~VYRService() override;
    VYRService(const VYRService&) = delete;
    VYRService& operator=(const VYRService&) = delete;

    ndk::ScopedAStatus Open(int32_t mode, int32_t* result) override;
    ndk::ScopedAStatus Close(int32_t handle) override;
    ndk::ScopedAStatus Enable(int32_t handle, int32_t period, int32_t* result) override;
    ndk::ScopedAStatus Disable(int32_t handle) override;
    ndk::ScopedAStatus SetCallback(
        int32_t handle, const std::shared_ptr<aidl::android::vyr::IEventCallback>& callback,
        int32_t* result) override;
    ndk::ScopedAStatus EnableLowPower(int32_t handle, bool enable, int32_t* result) override;
    ndk::ScopedAStatus PollOnce(int32_t handle, aidl::android::vyr::Event* event,
                                int32_t* result) override;
    ndk::ScopedAStatus ConfigureParameters(int32_t handle, const std::vector<int32_t>& params,
                                           int32_t* result) override;
    ndk::ScopedAStatus SetTorchLightState(int32_t state) override;
    ndk::ScopedAStatus EnableOnSample(int32_t handle, int32_t period, int32_t max_report_latency,
                                      int32_t* result) override;
    ndk::ScopedAStatus Flush(int32_t handle, int32_t* result) override;

    // `dumpsys vyrservice`: sensors, mode blocks, clients, queues, display, APEX and recent
    // events, as text or (argument "--json") one JSON object. Waits at most 1 s for any lock and
    // says what it could not read.
    binder_status_t dump(int fd, const char** args, uint32_t num_args) override;
    // Adds an entry to the dump's list of recent events.
    void RecordEvent(std::string text);
    // What the dump shows of the APEX update listener, which the process owns beside the service.
    void SetApexSection(std::function<DumpValue()> section);

  private:
    // Tests reach the scheduling state through it (tests/support).
    friend class VYRServiceTestPeer;

    int32_t NewHandle() REQUIRES(api_lock_);
    ServiceModeParams& ParamsForMode(int32_t mode);
    WorkQueue& QueueForMode(int32_t mode);

    // Removes the client. The thread of a client enabled on sample goes to `after_unlock`.
    void CloseInternal(int32_t handle, DeferredJoin* after_unlock) REQUIRES(api_lock_);
    // The one disable path, of Disable and of a client's death. For a dead client
    // (`client_died`) the notification thread is stopped but not joined: the death handler
    // joins it once it has released the API lock, since that thread may be inside OnEvent
    // waiting for the lock through a nested call. The thread of a live client enabled on sample
    // is stopped and handed to `after_unlock`, which the method joins after releasing the lock;
    // a version 1 client's thread is joined here, under the lock.
    void DisableInternal(int32_t handle, bool client_died, DeferredJoin* after_unlock)
        REQUIRES(api_lock_);
    void HandleBinderDied(AIBinder* binder) EXCLUDES(api_lock_);
    static void OnBinderDied(void* cookie);
    static void OnDeathLinkUnlinked(void* cookie);
    // Removes the entry's death link, so that its cookie can be given back.
    void UnlinkDeath(ClientEntry* entry) REQUIRES(api_lock_);
    // Frees the links that the runtime has let go of; called with the API lock held.
    void SweepDeathLinks() REQUIRES(api_lock_) EXCLUDES(links_mutex_);
    // Adds the caller of the current binder method to the processes that use the client.
    void NoteCaller(ClientEntry* entry) REQUIRES(api_lock_);
    void NoteProcess(ClientEntry* entry, pid_t pid) REQUIRES(api_lock_);
    // Stops watching the processes of a client that left the table, unless another client's
    // handle is used by them too.
    void ForgetProcesses(const ClientEntry& entry) REQUIRES(api_lock_);
    // One of the processes that use a handle has ended: a handle without a linked callback goes
    // when the last of them has, as a death notice would release it.
    void HandleClientProcessExit(ClientProcessWatcher::ProcessId id, pid_t pid) EXCLUDES(api_lock_);
    // What a client's death does, whichever way it was learnt: the log line, then the shared
    // internal disable and close. The entry goes to `released`, for FinishRelease.
    void ReleaseDeadClient(int32_t handle, const std::string& cause,
                           std::vector<std::shared_ptr<ClientEntry>>* released,
                           DeferredJoin* after_unlock) REQUIRES(api_lock_);
    // Joins the notification threads of released clients and drops their callbacks; called
    // without the API lock.
    static void FinishRelease(std::vector<std::shared_ptr<ClientEntry>>* released);

    void WorkLoop(unsigned int sensor_type);
    void EnableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    void DisableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    // The mode's enable count and active period as trace counters; by its worker.
    void TraceModeCounters(const ServiceModeParams& params);
    void ProcessLoop(ServiceModeParams* params);
    void WaitFor(ServiceModeParams* params, int32_t ms);
    void MonitorDisplayStatus(const std::string& path);
    // Keeps what the monitor last read, for the dump.
    void NoteDisplayState(std::string status, const std::string& state);

    // The dump, built under the locks it needs (the API lock waited for until `deadline` at
    // most, the others held only briefly by anyone) and written out after they are released.
    DumpValue BuildDump(std::chrono::steady_clock::time_point deadline) EXCLUDES(api_lock_);
    DumpValue DumpSensors() const;
    DumpValue DumpModeBlock(size_t index);
    DumpValue DumpClientsLocked() const REQUIRES(api_lock_);
    DumpValue DumpWorkQueues();
    DumpValue DumpDisplay() const;
    DumpValue DumpEvents() const;

    // The client that Enable or EnableOnSample (`method`) may enable, with its caller noted; null
    // with `*result` set for an unknown handle (-38) or a client already enabled (-17).
    std::shared_ptr<ClientEntry> EnableTarget(const char* method, int32_t handle, int32_t* result)
        REQUIRES(api_lock_);
    // What Enable and EnableOnSample share once the entry is set up: the delivery thread, the
    // work item and the dump's record.
    void StartClient(int32_t handle, const std::shared_ptr<ClientEntry>& entry) REQUIRES(api_lock_);
    // Asks the callback of `handle` for its interface version, once per callback, and keeps the
    // answer in its entry.
    void LearnCallbackVersion(int32_t handle) EXCLUDES(api_lock_);
    // What LearnCallbackVersion learnt; 1 while nothing is known.
    static int32_t CallbackVersion(const ClientEntry& entry);

    // A death link's cookie and recipient. The runtime reports when no notice can come any more
    // (the link was removed, or its notice delivered); the link is freed after that, never
    // before, and never inside the runtime's report.
    struct DeathLink {
        DeathLink(AIBinder* binder, VYRService* service)
            : cookie(binder, service),
              recipient(AIBinder_DeathRecipient_new(&VYRService::OnBinderDied),
                        &AIBinder_DeathRecipient_delete) {}
        DeathCookie cookie;
        std::unique_ptr<AIBinder_DeathRecipient, void (*)(AIBinder_DeathRecipient*)> recipient;
        bool unlinked = false;
    };

    AmbientLightSensor* als_sensor_ = nullptr;
    ubk::RangeSensor* range_sensor_ = nullptr;
    // Read by the processing loop without the API lock.
    std::atomic<uint32_t> num_clients_{0};
    int32_t als_params_index_ = 0;
    int32_t range_params_index_ = 2;
    // Block 1 is served by no mode; only blocks 0 and 2 are ever selected.
    std::array<ServiceModeParams, 3> mode_params_;
    // Taken before a queue's mutex and before a client's notify_mutex (through the join), never
    // after them. The order is not declared (ACQUIRED_BEFORE): the analysis checks orders only
    // with -Wthread-safety-beta and cannot name the per-worker sensor locks or the per-client
    // mutexes, which live in arrays and entries.
    ApiLock api_lock_;
    std::array<std::mutex, 2> sensor_locks_;
    std::unordered_map<int32_t, std::shared_ptr<ClientEntry>> clients_ GUARDED_BY(api_lock_);
    // -1 is never a handle, so the draw for the display handle itself excludes nothing else.
    int32_t display_handle_ = -1;
    // Read and written by nothing; kept so that the object keeps the deployed layout.
    std::string reserved_;
    std::atomic<bool> low_power_{false};
    std::thread display_thread_;
    std::atomic<bool> running_{true};
    std::unordered_map<unsigned int, std::thread> worker_threads_;
    std::array<WorkQueue, 2> work_queues_;
    // Not the API lock: the runtime reports an unlinked link also from inside a method's unlink.
    std::mutex links_mutex_;
    std::unordered_map<const DeathCookie*, std::unique_ptr<DeathLink>> death_links_
        GUARDED_BY(links_mutex_);
    std::unique_ptr<ClientProcessWatcher> process_watcher_;

    // What only the dump reads. Why each sensor is absent, fixed at construction.
    std::string als_presence_;
    std::string range_presence_;
    // The range sensor's power as the worker left it, and the last torch state passed on (-1
    // before any).
    std::atomic<bool> range_initialized_{false};
    std::atomic<bool> range_enabled_{false};
    std::atomic<int32_t> torch_state_{-1};
    mutable std::mutex display_mutex_;
    std::string display_status_ GUARDED_BY(display_mutex_) = "not started";
    std::string display_state_ GUARDED_BY(display_mutex_);
    std::chrono::steady_clock::time_point display_read_time_ GUARDED_BY(display_mutex_);
    mutable std::mutex apex_mutex_;
    std::function<DumpValue()> apex_section_ GUARDED_BY(apex_mutex_);
    EventRing events_;
    // Polls, the version 1 notification loops and the version 2 delivery on sample.
    EventDelivery delivery_{
        [this](int32_t mode) -> ServiceModeParams& { return ParamsForMode(mode); }};
};

// Builds the production service and registers it as "vyrservice".
void CreateAndRegisterService();
// The same, handing the service to `prepare` before it is registered (main uses it to show the
// APEX listener in the dump).
void CreateAndRegisterService(const std::function<void(VYRService&)>& prepare);
// Gives the calling thread to the binder thread pool; returns only if the pool is left.
void JoinThreadPool();

}  // namespace binder
}  // namespace vyr
}  // namespace android
