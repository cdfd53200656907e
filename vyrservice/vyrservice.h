#pragma once

#include <aidl/android/vyr/BnVYRService.h>
#include <android-base/thread_annotations.h>
#include <android/binder_ibinder.h>
#include <sys/types.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <unordered_map>
#include <vector>

#include "ambient_light_sensor.h"
#include "client_entry.h"
#include "client_process_watcher.h"
#include "service_config.h"
#include "service_mode_params.h"
#include "ubk/range_sensor.h"
#include "work_queue.h"

namespace android {
namespace vyr {
namespace binder {

// Shares the range sensor (mode 3) and the spectral ambient-light sensor (mode 1) between
// clients. Every binder method and the death handler run wholly under `api_lock_`; sensors are
// switched only by the two workers, and sampled only by the per-mode processing threads.
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

    // A consistent copy of one mode block's scheduling state, for tests and diagnostics; waits
    // for the block's worker to finish the item it is applying.
    struct ModeBlockSnapshot {
        bool running;
        int32_t mode;
        int32_t enable_count;
        int32_t active_period;
        std::unordered_map<int32_t, int32_t> periods;
    };
    ModeBlockSnapshot SnapshotModeBlock(size_t index);
    // Queues an item for the worker of its mode, as the binder methods and the display monitor
    // do. Lets tests reach worker states that no client sequence produces.
    void PushWorkItem(const WorkItem& item);
    // Death links not yet given back: one per client with a callback, plus any whose notice is
    // on its way.
    size_t DeathLinkCount();

  private:
    int32_t NewHandle();
    ServiceModeParams& ParamsForMode(int32_t mode);
    WorkQueue& QueueForMode(int32_t mode);

    void CloseInternal(int32_t handle);
    void DisableInternal(int32_t handle, bool);
    void HandleBinderDied(AIBinder* binder);
    static void OnBinderDied(void* cookie);
    static void OnDeathLinkUnlinked(void* cookie);
    // Removes the entry's death link, so that its cookie can be given back.
    void UnlinkDeath(ClientEntry* entry);
    // Frees the links that the runtime has let go of; called with the API lock held.
    void SweepDeathLinks() EXCLUDES(links_mutex_);
    // Disables and closes every client that the ended process opened, as a death notice does.
    void HandleClientProcessExit(pid_t pid);

    void WorkLoop(unsigned int sensor_type);
    void EnableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    void DisableWork(const WorkItem& item, ServiceModeParams* params, unsigned int sensor_type);
    void ProcessLoop(ServiceModeParams* params);
    void WaitFor(ServiceModeParams* params, int32_t ms);
    void MonitorDisplayStatus(const std::string& path);

    bool PollInternal(int32_t handle, int32_t mode, aidl::android::vyr::Event* event);
    // Holds the entry: a nested Close from OnEvent leaves it valid until the loop has ended.
    void NotifyLoop(int32_t handle, std::shared_ptr<ClientEntry> entry, uint64_t generation);

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
    std::timed_mutex api_lock_;
    std::array<std::mutex, 2> sensor_locks_;
    std::unordered_map<int32_t, std::shared_ptr<ClientEntry>> clients_;
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
};

// Builds the production service and registers it as "vyrservice".
void CreateAndRegisterService();
// Gives the calling thread to the binder thread pool; returns only if the pool is left.
void JoinThreadPool();

}  // namespace binder
}  // namespace vyr
}  // namespace android
