// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <aidl/android/vyr/BnVYRService.h>
#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>
#include <android/log.h>
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
#include "client_processes.h"
#include "death_link_registry.h"
#include "deferred_join.h"
#include "dump_value.h"
#include "event_delivery.h"
#include "service_config.h"
#include "service_dump_state.h"
#include "service_mode_params.h"
#include "ubk/range_sensor.h"
#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

// Threads and locks. "a -> b": b may be taken while a is held, never the other way; locks not
// joined by an arrow are never held together.
//
// thread: runs          | file                | locks, outer -> inner       | waits on
// ----------------------+---------------------+-----------------------------+----------------------
// binder pool:          | vyrservice.cpp,     | api_lock_ -> a WorkQueue's, | a v1 notification
// IVYRService methods,  | vyrservice_dump.cpp | a notify_mutex, a           | thread (joined under
// dump, death notices   |                     | SampleQueue's, or           | api_lock_); a v2
//                       |                     | data_mutex -> a             | delivery thread
//                       |                     | SampleQueue's; the death    | (after it, by a
//                       |                     | links' mutex alone          | DeferredJoin); a
//                       |                     |                             | callback's version
// ----------------------+---------------------+-----------------------------+----------------------
// workers 0 and 1:      | vyrservice_threads  | its sensor lock;            | the sensor libraries;
// WorkLoop, EnableWork, |   .cpp              | a block's dump.mutex        | joins the mode's
// DisableWork           |                     |                             | processing thread
// ----------------------+---------------------+-----------------------------+----------------------
// processing, one per   | vyrservice_threads  | data_mutex -> a             | the sensor library's
// enabled mode:         |   .cpp              | SampleQueue's;              | read; wait_cv
// ProcessLoop, WaitFor  |                     | wait_mutex alone            |
// ----------------------+---------------------+-----------------------------+----------------------
// display monitor:      | vyrservice_threads  | a WorkQueue's; the dump     | poll on the backlight
// MonitorDisplayStatus  |   .cpp              | state's own, each alone     | attribute
// ----------------------+---------------------+-----------------------------+----------------------
// notification, v1:     | delivery/event_     | data_mutex; notify_mutex    | the client's OnEvent
// NotifyLoop            |   delivery.cpp      |                             |
// ----------------------+---------------------+-----------------------------+----------------------
// delivery, v2:         | delivery/event_     | its SampleQueue's;          | the client's OnEvent,
// SampleLoop            |   delivery.cpp      | data_mutex                  | OnEventBatch and
//                       |                     |                             | OnFlushComplete
// ----------------------+---------------------+-----------------------------+----------------------
// process watcher:      | clients/client_     | its own; api_lock_          | the pidfds of client
// ClientProcessWatcher  |   process_watcher   | (through                    | processes
//                       |   .cpp              | HandleClientProcess-        |
//                       |                     | Exit)                       |
//
// The processing loop also writes its mode's sample ring (version 3) under data_mutex; it wakes
// the ring's readers but never waits for one, nor takes anything of theirs.
//
// Only the binder pool and the process watcher take api_lock_, so a thread joined under it never
// waits for it, but through a client's nested call (below). A helper that must be called with
// api_lock_ held ends in "Locked", except CloseInternal and DisableInternal, whose names are
// older than that rule.

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
    ndk::ScopedAStatus EnableRing(int32_t handle, int32_t period, ndk::ScopedFileDescriptor* ring,
                                  int32_t* result) override;

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

    int32_t NewHandleLocked() REQUIRES(api_lock_);
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

    // The death handler's entry points: a death notice of a callback's binder, and the end of a
    // process that used a handle without a linked callback (on the process watcher's thread).
    static void OnBinderDied(void* cookie);
    void HandleBinderDied(AIBinder* binder) EXCLUDES(api_lock_);
    void HandleClientProcessExit(ClientProcessWatcher::ProcessId id, pid_t pid) EXCLUDES(api_lock_);
    // What a client's death does, whichever way it was learnt: the log line, then the shared
    // internal disable and close. The entry goes to `released`, for FinishRelease.
    void ReleaseDeadClientLocked(int32_t handle, const std::string& cause,
                                 std::vector<std::shared_ptr<ClientEntry>>* released,
                                 DeferredJoin* after_unlock) REQUIRES(api_lock_);
    // Joins the notification threads of released clients and drops their callbacks; called
    // without the API lock.
    static void FinishRelease(std::vector<std::shared_ptr<ClientEntry>>* released);

    // The entry of `handle`, its caller noted as a user; null for an unknown handle, logged at
    // `priority` as "`method` invalid handle `handle`" with `*result` set to `error`.
    std::shared_ptr<ClientEntry> CallerEntryLocked(const char* method, int32_t handle,
                                                   android_LogPriority priority, int32_t error,
                                                   int32_t* result) REQUIRES(api_lock_);
    // The client that Enable or EnableOnSample (`method`) may enable, with its caller noted; null
    // with `*result` set for an unknown handle (-38) or a client already enabled (-17).
    std::shared_ptr<ClientEntry> EnableTargetLocked(const char* method, int32_t handle,
                                                    int32_t* result) REQUIRES(api_lock_);
    // A read-only descriptor of the ring of `mode`, the ring made first if need be; -1 (logged)
    // when it cannot be.
    ndk::ScopedFileDescriptor RingReaderLocked(int32_t mode) REQUIRES(api_lock_);
    // Takes the client off its mode's ring clients, if it is one: its ring is no longer written
    // for it.
    void LeaveRingLocked(ClientEntry& entry) REQUIRES(api_lock_);
    // What Enable and EnableOnSample share once the entry is set up: the delivery thread, the
    // work item and the dump's record.
    void StartClientLocked(int32_t handle, const std::shared_ptr<ClientEntry>& entry)
        REQUIRES(api_lock_);
    // Asks the callback of `handle` for its interface version, once per callback, and keeps the
    // answer in its entry.
    void LearnCallbackVersion(int32_t handle) EXCLUDES(api_lock_);
    // What LearnCallbackVersion learnt; 1 while nothing is known.
    static int32_t CallbackVersion(const ClientEntry& entry);

    // The service's own threads (vyrservice_threads.cpp).
    void StartWorker(unsigned int sensor_type);
    void WorkLoop(unsigned int sensor_type);
    void EnableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    void DisableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    // The mode's enable count and active period as trace counters; by its worker.
    void TraceModeCounters(const ServiceModeParams& params);
    void ProcessLoop(ServiceModeParams* params);
    void WaitFor(ServiceModeParams* params, int32_t ms);
    void MonitorDisplayStatus(const std::string& path);

    // The dump, built under the locks it needs (the API lock waited for until `deadline` at
    // most, the others held only briefly by anyone) and written out after they are released.
    DumpValue BuildDump(std::chrono::steady_clock::time_point deadline) EXCLUDES(api_lock_);
    DumpValue DumpClientsLocked() const REQUIRES(api_lock_);

    // The records of the service.
    AmbientLightSensor* als_sensor_ = nullptr;
    ubk::RangeSensor* range_sensor_ = nullptr;
    // Read by the processing loop without the API lock.
    std::atomic<uint32_t> num_clients_{0};
    int32_t als_params_index_ = 0;
    int32_t range_params_index_ = 2;
    // Block 1 is served by no mode; only blocks 0 and 2 are ever selected.
    std::array<ServiceModeParams, 3> mode_params_;
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

    // Its helpers.
    DeathLinkRegistry death_links_{this, &VYRService::OnBinderDied};
    ClientProcesses client_processes_{[this](ClientProcessWatcher::ProcessId id, pid_t pid) {
        HandleClientProcessExit(id, pid);
    }};
    ServiceDumpState dump_state_;
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
