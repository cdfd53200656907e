// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#define LOG_TAG "vyrservice"
// Its slices and counters show up in a capture of the camera category.
#define ATRACE_TAG ATRACE_TAG_CAMERA

#include "vyrservice.h"

#include <android-base/logging.h>
#include <android-base/unique_fd.h>
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <cutils/trace.h>
#include <fcntl.h>
#include <log/log.h>
#include <poll.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <optional>

#include "event_conversion.h"
#include "sensor_modes.h"

namespace android {
namespace vyr {
namespace binder {

using aidl::android::vyr::Event;
using aidl::android::vyr::IEventCallback;

namespace {

constexpr char kAlsProperty[] = "persist.vendor.camera.vyr_supported";
constexpr char kRangeProperty[] = "persist.vendor.camera.vyr_range_supported";
constexpr char kServiceName[] = "vyrservice";

constexpr uint32_t kMaxClients = 10;
constexpr int32_t kDefaultPeriodMs = 1000;
constexpr int32_t kMaxRecomputedPeriodMs = 5000;
constexpr int32_t kDisplayPeriodMs = 1000;
// In low-power mode the spectral sensor is powered up again this long before the next sample.
constexpr int32_t kLowPowerWakeMarginMs = 90;
constexpr size_t kControlSettingsCount = 11;
constexpr size_t kDisplayStateBufferSize = 50;
// The longest that samples may be held for a client enabled on sample. A batch is handed over
// earlier when it reaches its byte budget, so this bounds how stale a held sample can get at low
// rates, not the memory it takes.
constexpr int32_t kMaxReportLatencyMs = 60000;

// A call that waits this long for another one ends the service: something is stuck for good.
#define LOCK_API()                                         \
    ApiLockGuard lck(api_lock_, std::chrono::seconds(10)); \
    CHECK(lck.owns_lock())

ndk::ScopedAStatus Ok() {
    return ndk::ScopedAStatus(AStatus_newOk());
}

int64_t MillisSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() -
                                                                 start)
        .count();
}

int64_t BootTimeNs() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

// Absolute system-clock time `left` from now, saturated at the clock's largest time point.
std::chrono::system_clock::time_point SystemDeadline(std::chrono::steady_clock::duration left) {
    const auto now = std::chrono::system_clock::now();
    const auto room = std::chrono::system_clock::time_point::max() - now;
    const auto wanted = std::chrono::ceil<std::chrono::system_clock::duration>(left);
    return wanted >= room ? std::chrono::system_clock::time_point::max() : now + wanted;
}

}  // namespace

VYRService::VYRService(const ServiceConfig& config)
    : process_watcher_(std::make_unique<ClientProcessWatcher>(
          [this](ClientProcessWatcher::ProcessId id, pid_t pid) {
              HandleClientProcessExit(id, pid);
          })) {
    display_handle_ = NewHandle();
    std::this_thread::sleep_for(config.startup_delay);
    worker_threads_.reserve(2);

    if (config.get_bool_property(kAlsProperty, false)) {
        als_sensor_ = AmbientLightSensor::Create();
        als_presence_ = als_sensor_ != nullptr ? "present" : "absent: Create() failed";
        NoteDisplayState("starting", "");
        display_thread_ =
            std::thread(&VYRService::MonitorDisplayStatus, this, config.display_state_path);
        if (als_sensor_ != nullptr) {
            worker_threads_.emplace(kAlsSensorType,
                                    std::thread(&VYRService::WorkLoop, this, kAlsSensorType));
        } else {
            ALOGW("SpectralSensor::Create() returned NULL.");
        }
    } else {
        als_sensor_ = nullptr;
        als_presence_ = std::string("absent: ") + kAlsProperty + " is off";
        ALOGW("SpectralSensor::Create() returned NULL.");
    }

    if (config.get_bool_property(kRangeProperty, true)) {
        range_sensor_ = ubk::RangeSensor::Create();
        range_presence_ = range_sensor_ != nullptr ? "present" : "absent: Create() failed";
        if (range_sensor_ != nullptr) {
            worker_threads_.emplace(kRangeSensorType,
                                    std::thread(&VYRService::WorkLoop, this, kRangeSensorType));
        } else {
            ALOGW("ubk::RangeSensor::Create() returned NULL.");
        }
    } else {
        range_sensor_ = nullptr;
        range_presence_ = std::string("absent: ") + kRangeProperty + " is off";
        ALOGW("ubk::RangeSensor::Create() returned NULL.");
    }

    clients_.reserve(kMaxClients);
}

VYRService::~VYRService() {
    // First, so that no process exit reaches a service that is going away.
    process_watcher_.reset();
    running_ = false;
    if (display_thread_.joinable()) {
        display_thread_.join();
    }
    for (auto& [sensor_type, thread] : worker_threads_) {
        work_queues_[sensor_type].WakeAll();
        if (thread.joinable()) {
            thread.join();
        }
    }
    AmbientLightSensor::Destroy();
    ubk::RangeSensor::Destroy();

    // A notification thread holds its entry, so dropping the table would not stop it: each
    // client is released here, its thread joined before its callback goes.
    for (auto& [handle, entry] : clients_) {
        entry->Disable();
        entry->callback.reset();
    }

    // Deleting a recipient unlinks what is still linked. The runtime reports each such unlink
    // while its link is being freed here, its cookie still valid, and finds the table empty.
    std::unordered_map<const DeathCookie*, std::unique_ptr<DeathLink>> links;
    {
        std::lock_guard<std::mutex> lock(links_mutex_);
        links.swap(death_links_);
    }
}

int32_t VYRService::NewHandle() {
    while (true) {
        // The generator's maximum wraps to the most negative value, which is still a handle.
        const int32_t handle =
            static_cast<int32_t>(static_cast<uint32_t>(rand()) + static_cast<uint32_t>(1));
        if (handle == -1 || handle == display_handle_ || clients_.count(handle) != 0) {
            continue;
        }
        return handle;
    }
}

ServiceModeParams& VYRService::ParamsForMode(int32_t mode) {
    if (mode == kRangeMode) {
        return mode_params_[range_params_index_];
    }
    if (mode == kAlsMode) {
        return mode_params_[als_params_index_];
    }
    return mode_params_[0];
}

WorkQueue& VYRService::QueueForMode(int32_t mode) {
    return work_queues_[mode == kRangeMode ? kRangeSensorType : kAlsSensorType];
}

// Client table.

ndk::ScopedAStatus VYRService::Open(int32_t mode, int32_t* result) {
    LOCK_API();
    if (mode != kAlsMode && mode != kRangeMode) {
        ALOGE("%s invalid sensor mode: %d", __func__, mode);
        *result = -EINVAL;
    } else if (num_clients_ >= kMaxClients) {
        ALOGE("%s max client number reached", __func__);
        *result = -1;
    } else if (mode == kAlsMode && als_sensor_ == nullptr) {
        ALOGE("%s als sensor unavailable", __func__);
        *result = -ENODEV;
    } else if (mode == kRangeMode && range_sensor_ == nullptr) {
        ALOGE("%s vyr range sensor unavailable", __func__);
        *result = -ENODEV;
    } else {
        const int32_t handle = NewHandle();
        auto entry = std::make_shared<ClientEntry>(mode);
        std::string opened =
            "open handle " + std::to_string(handle) + " mode " + std::to_string(mode);
        NoteCaller(entry.get());
        if (!entry->processes.empty()) {
            entry->opener_pid = entry->processes.begin()->second;
            opened += " pid " + std::to_string(entry->opener_pid);
        }
        clients_.emplace(handle, std::move(entry));
        ++num_clients_;
        *result = handle;
        RecordEvent(std::move(opened));
    }
    return Ok();
}

ndk::ScopedAStatus VYRService::Close(int32_t handle) {
    DeferredJoin after_unlock;
    LOCK_API();
    CloseInternal(handle, &after_unlock);
    return Ok();
}

void VYRService::CloseInternal(int32_t handle, DeferredJoin* after_unlock) {
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        return;
    }
    std::shared_ptr<ClientEntry> entry = std::move(it->second);
    clients_.erase(it);
    --num_clients_;
    RecordEvent("close handle " + std::to_string(handle));
    UnlinkDeath(entry.get());
    ForgetProcesses(*entry);
    SweepDeathLinks();
    // Its death handler joins the thread and drops the callback after releasing the API lock.
    if (entry->AwaitsJoin()) return;
    if (entry->on_sample) {
        // The thread holds the entry and its own reference to the callback.
        after_unlock->Add(entry->StopAndHandOver());
    } else {
        // The notification thread stops before the callback is dropped; one that is running
        // this very call (from OnEvent) keeps the entry until it has ended.
        entry->Disable();
    }
    entry->callback.reset();
}

void VYRService::NoteCaller(ClientEntry* entry) {
    NoteProcess(entry, AIBinder_getCallingPid());
}

void VYRService::NoteProcess(ClientEntry* entry, pid_t pid) {
    if (pid <= 0 || pid == getpid()) {
        entry->unwatched_user = true;
        return;
    }
    const std::optional<ClientProcessWatcher::ProcessId> id = process_watcher_->Watch(pid);
    if (!id) {
        entry->unwatched_user = true;
        return;
    }
    entry->processes.emplace(*id, pid);
}

void VYRService::ForgetProcesses(const ClientEntry& entry) {
    for (const auto& [id, pid] : entry.processes) {
        const bool shared = std::any_of(
            clients_.begin(), clients_.end(),
            [id = id](const auto& client) { return client.second->processes.count(id) != 0; });
        if (!shared) process_watcher_->Unwatch(id);
    }
}

// Enable, disable and low power.

std::shared_ptr<ClientEntry> VYRService::EnableTarget(const char* method, int32_t handle,
                                                      int32_t* result) {
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGE("%s invalid handle %d", method, handle);
        *result = -ENOSYS;
        return nullptr;
    }
    NoteCaller(it->second.get());
    if (it->second->state == kClientEnabled) {
        *result = -EEXIST;
        return nullptr;
    }
    return it->second;
}

ndk::ScopedAStatus VYRService::Enable(int32_t handle, int32_t period, int32_t* result) {
    LOCK_API();
    std::shared_ptr<ClientEntry> target = EnableTarget(__func__, handle, result);
    if (target == nullptr) return Ok();
    ClientEntry& entry = *target;
    ALOGI("%s handle %d, mode %d", __func__, handle, entry.mode);
    entry.period = period >= 1 ? period : kDefaultPeriodMs;
    entry.on_sample = false;
    entry.max_report_latency = 0;
    StartClient(handle, target);
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::EnableOnSample(int32_t handle, int32_t period,
                                              int32_t max_report_latency, int32_t* result) {
    LearnCallbackVersion(handle);
    LOCK_API();
    std::shared_ptr<ClientEntry> target = EnableTarget(__func__, handle, result);
    if (target == nullptr) return Ok();
    ClientEntry& entry = *target;
    if (max_report_latency < 0 || max_report_latency > kMaxReportLatencyMs ||
        (max_report_latency > 0 && !entry.callback)) {
        ALOGE("%s handle %d: invalid max report latency %d", __func__, handle, max_report_latency);
        *result = -EINVAL;
        return Ok();
    }
    if (max_report_latency > 0 && CallbackVersion(entry) < 2) {
        ALOGE("%s handle %d: a version %d callback cannot take batches", __func__, handle,
              CallbackVersion(entry));
        *result = -EOPNOTSUPP;
        return Ok();
    }
    ALOGI("%s handle %d, mode %d, max report latency %d", __func__, handle, entry.mode,
          max_report_latency);
    entry.period = period >= 1 ? period : kDefaultPeriodMs;
    entry.on_sample = true;
    entry.max_report_latency = max_report_latency;
    StartClient(handle, target);
    *result = 0;
    return Ok();
}

void VYRService::LearnCallbackVersion(int32_t handle) {
    std::shared_ptr<IEventCallback> callback;
    {
        LOCK_API();
        auto it = clients_.find(handle);
        if (it == clients_.end() || !it->second->callback || it->second->callback_version != 0) {
            return;
        }
        callback = it->second->callback;
    }
    // Asked without the API lock: a client slow to answer holds up its own call only.
    int32_t version = 0;
    // A callback that cannot say (built before versions were reported) is of version 1.
    if (!callback->getInterfaceVersion(&version).isOk() || version < 1) version = 1;
    LOCK_API();
    auto it = clients_.find(handle);
    // A callback set meanwhile is asked by the next EnableOnSample.
    if (it != clients_.end() && it->second->callback == callback) {
        it->second->callback_version = version;
    }
}

int32_t VYRService::CallbackVersion(const ClientEntry& entry) {
    // Not known yet (replaced while being asked): none of version 2's methods for it.
    return std::max(entry.callback_version, 1);
}

void VYRService::StartClient(int32_t handle, const std::shared_ptr<ClientEntry>& entry) {
    delivery_.Start(handle, entry);
    QueueForMode(entry->mode).PushAndSignal(WorkItem{true, entry->mode, handle, entry->period});
    RecordEvent("enable handle " + std::to_string(handle) + " period " +
                std::to_string(entry->period));
}

ndk::ScopedAStatus VYRService::Flush(int32_t handle, int32_t* result) {
    LOCK_API();
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGE("%s invalid handle %d", __func__, handle);
        *result = -ENOSYS;
        return Ok();
    }
    ClientEntry& entry = *it->second;
    NoteCaller(&entry);
    if (entry.state != kClientEnabled || !entry.sample_queue) {
        ALOGE("%s handle %d is not enabled on sample with a callback", __func__, handle);
        *result = -EINVAL;
        return Ok();
    }
    if (CallbackVersion(entry) < 2) {
        ALOGE("%s handle %d: a version %d callback cannot be told of a flush", __func__, handle,
              CallbackVersion(entry));
        *result = -EOPNOTSUPP;
        return Ok();
    }
    entry.sample_queue->Flush();
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::Disable(int32_t handle) {
    DeferredJoin after_unlock;
    LOCK_API();
    auto it = clients_.find(handle);
    if (it != clients_.end()) NoteCaller(it->second.get());
    DisableInternal(handle, /*client_died=*/false, &after_unlock);
    return Ok();
}

void VYRService::DisableInternal(int32_t handle, bool client_died, DeferredJoin* after_unlock) {
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGW("%s invalid handle %d", __func__, handle);
        return;
    }
    ClientEntry& entry = *it->second;
    if (entry.state == kClientDisabled) {
        ALOGD("%s already in disable state %d", __func__, handle);
        return;
    }
    ALOGI("%s handle %d, mode %d", __func__, handle, entry.mode);
    if (client_died) {
        entry.StopNotify();
    } else if (entry.on_sample) {
        after_unlock->Add(entry.StopAndHandOver());
    } else {
        // A version 1 client's thread is joined under the API lock.
        entry.Disable();
    }
    QueueForMode(entry.mode).PushAndSignal(WorkItem{false, entry.mode, handle, 0});
    RecordEvent("disable handle " + std::to_string(handle));
}

ndk::ScopedAStatus VYRService::EnableLowPower(int32_t handle, bool enable, int32_t* result) {
    LOCK_API();
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGE("%s invalid handle %d", __func__, handle);
        *result = -ENOSYS;
        return Ok();
    }
    NoteCaller(it->second.get());
    if (it->second->mode == kRangeMode) {
        *result = -EINVAL;
        return Ok();
    }
    // Service-wide: the last caller wins.
    low_power_ = enable;
    *result = 0;
    return Ok();
}

// Callback registration and client death.

ndk::ScopedAStatus VYRService::SetCallback(int32_t handle,
                                           const std::shared_ptr<IEventCallback>& callback,
                                           int32_t* result) {
    LOCK_API();
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGW("%s invalid handle %d", __func__, handle);
        *result = -EINVAL;
        return Ok();
    }
    ClientEntry& entry = *it->second;
    NoteCaller(&entry);
    if (entry.state == kClientEnabled) {
        // The notification thread reads the callback without a lock.
        ALOGE("%s failed. callback can only be set at DISABLE state", __func__);
        *result = -1;
        return Ok();
    }
    // A binder of another interface arrives as an empty pointer; nothing could be called on it.
    if (!callback) {
        ALOGE("%s null callback", __func__);
        *result = -EINVAL;
        return Ok();
    }
    // The earlier link goes: one link per client keeps memory bounded by the live callbacks,
    // and the client is still disabled and closed once when its process dies.
    UnlinkDeath(&entry);
    entry.callback = callback;
    entry.callback_version = 0;
    entry.callback_binder = entry.callback->asBinder();

    auto owned = std::make_unique<DeathLink>(entry.callback_binder.get(), this);
    DeathLink* link = owned.get();
    {
        std::lock_guard<std::mutex> lock(links_mutex_);
        death_links_.emplace(&link->cookie, std::move(owned));
    }
    AIBinder_DeathRecipient_setOnUnlinked(link->recipient.get(), &VYRService::OnDeathLinkUnlinked);
    entry.death_cookie = &link->cookie;
    entry.death_recipient = link->recipient.get();
    if (AIBinder_linkToDeath(entry.callback_binder.get(), entry.death_recipient,
                             const_cast<DeathCookie*>(entry.death_cookie)) != STATUS_OK) {
        // No notice can come for a link that was never made (a binder of this process, or one
        // already dead: its client then goes with its process); the runtime has reported it
        // unlinked already.
        entry.death_cookie = nullptr;
        entry.death_recipient = nullptr;
    }
    SweepDeathLinks();
    *result = 0;
    return Ok();
}

void VYRService::UnlinkDeath(ClientEntry* entry) {
    if (entry->death_recipient == nullptr) {
        return;
    }
    // A notice already on its way is delivered anyway; the runtime reports the unlink after it.
    AIBinder_unlinkToDeath(entry->callback_binder.get(), entry->death_recipient,
                           const_cast<DeathCookie*>(entry->death_cookie));
    entry->death_recipient = nullptr;
    entry->death_cookie = nullptr;
}

void VYRService::OnDeathLinkUnlinked(void* cookie) {
    const auto* death_cookie = static_cast<const DeathCookie*>(cookie);
    VYRService* service = death_cookie->second;
    std::lock_guard<std::mutex> lock(service->links_mutex_);
    auto it = service->death_links_.find(death_cookie);
    if (it != service->death_links_.end()) {
        it->second->unlinked = true;
    }
}

void VYRService::SweepDeathLinks() {
    std::vector<std::unique_ptr<DeathLink>> released;
    {
        std::lock_guard<std::mutex> lock(links_mutex_);
        for (auto it = death_links_.begin(); it != death_links_.end();) {
            if (it->second->unlinked) {
                released.push_back(std::move(it->second));
                it = death_links_.erase(it);
            } else {
                ++it;
            }
        }
    }
    // Deleted outside the lock: deleting a recipient may report an unlink.
}

void VYRService::OnBinderDied(void* cookie) {
    ALOGI("Receive binder death callback");
    const auto* death_cookie = static_cast<const DeathCookie*>(cookie);
    death_cookie->second->HandleBinderDied(death_cookie->first);
}

void VYRService::HandleBinderDied(AIBinder* binder) {
    std::vector<std::shared_ptr<ClientEntry>> released;
    DeferredJoin after_unlock;
    {
        LOCK_API();
        auto it = std::find_if(clients_.begin(), clients_.end(), [binder](const auto& client) {
            return client.second->callback_binder.get() == binder;
        });
        if (it != clients_.end())
            ReleaseDeadClient(it->first, "callback", &released, &after_unlock);
    }
    FinishRelease(&released);
}

void VYRService::ReleaseDeadClient(int32_t handle, const std::string& cause,
                                   std::vector<std::shared_ptr<ClientEntry>>* released,
                                   DeferredJoin* after_unlock) {
    std::shared_ptr<ClientEntry> entry = clients_.at(handle);
    ALOGI("client %d mode %d died; disable sensor and remove client handle", handle, entry->mode);
    RecordEvent("death of handle " + std::to_string(handle) + " (" + cause + ")");
    if (entry->death_recipient != nullptr) {
        // The cookie is deliberately null, and no link is made with a null one, so this removes
        // nothing: the link whose notice runs now ends with it, and the runtime reports that.
        AIBinder_unlinkToDeath(entry->callback_binder.get(), entry->death_recipient, nullptr);
        // The entry's own link is not removed either: its binder is dead, and a link removed
        // while the notices run gets none (libbinder holds obituaries weakly). That notice may be
        // the one that releases another handle whose callback is the same binder; it finds this
        // entry gone and releases that one. Each link is freed once the runtime reports it ended.
        entry->death_recipient = nullptr;
        entry->death_cookie = nullptr;
    }
    DisableInternal(handle, /*client_died=*/true, after_unlock);
    CloseInternal(handle, after_unlock);
    released->push_back(std::move(entry));
}

void VYRService::FinishRelease(std::vector<std::shared_ptr<ClientEntry>>* released) {
    for (const std::shared_ptr<ClientEntry>& entry : *released) {
        entry->Disable();
        entry->callback.reset();
    }
    released->clear();
}

void VYRService::HandleClientProcessExit(ClientProcessWatcher::ProcessId id, pid_t pid) {
    std::vector<std::shared_ptr<ClientEntry>> released;
    DeferredJoin after_unlock;
    {
        LOCK_API();
        std::vector<int32_t> handles;
        for (const auto& [handle, entry] : clients_) {
            if (entry->processes.erase(id) == 0) continue;
            // A linked callback's death notice alone releases its handle; a process that could
            // not be watched may still be using it.
            if (entry->processes.empty() && !entry->unwatched_user &&
                entry->death_recipient == nullptr) {
                handles.push_back(handle);
            }
        }
        // The same record and clean-up as a death notice.
        for (int32_t handle : handles) {
            ALOGI("Receive binder death callback");
            ReleaseDeadClient(handle, "process " + std::to_string(pid), &released, &after_unlock);
        }
    }
    FinishRelease(&released);
}

// Sensor parameters and torch state.

ndk::ScopedAStatus VYRService::ConfigureParameters(int32_t handle,
                                                   const std::vector<int32_t>& params,
                                                   int32_t* result) {
    LOCK_API();
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGE("%s invalid handle %d", __func__, handle);
        *result = -ENOSYS;
        return Ok();
    }
    NoteCaller(it->second.get());
    const int32_t mode = it->second->mode;
    if (mode != kRangeMode) {
        ALOGE("%s, mode %d is not supported", __func__, mode);
        *result = -EINVAL;
        return Ok();
    }
    if (params.size() != kControlSettingsCount) {
        ALOGE("%s data size %zu is not equal to %zu", __func__, params.size() * sizeof(int32_t) / 4,
              kControlSettingsCount);
        *result = -EINVAL;
        return Ok();
    }
    // Open admits no range client without the sensor; this only keeps a broken setup alive.
    if (range_sensor_ == nullptr) {
        ALOGE("%s vyr range sensor unavailable", __func__);
        *result = -ENODEV;
        return Ok();
    }
    ControlSettings settings{};
    settings.frame_rate_hz = params[0];
    settings.timing_budget_ms = params[1];
    settings.signal_threshold = params[2];
    settings.sigma_threshold_mm = params[3];
    settings.smudge_correction = params[4] == 1;
    settings.crosstalk_correction = params[5] == 1;
    settings.ambient_correction = params[6] == 1;
    settings.reserved = 0;
    settings.distance_mode = params[7];
    settings.range_min_mm = params[8];
    settings.range_max_mm = params[9];
    settings.zone_layout = params[10];
    range_sensor_->ConfigureParameters(settings);
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::SetTorchLightState(int32_t state) {
    LOCK_API();
    if (als_sensor_ != nullptr) {
        als_sensor_->SetTorchLightState(static_cast<unsigned char>(state));
        torch_state_ = state;
        ALOGI("torch state changed to %d", state);
    }
    return Ok();
}

// Workers.

void VYRService::WorkLoop(unsigned int sensor_type) {
    WorkQueue& queue = work_queues_[sensor_type];
    std::mutex& sensor_lock = sensor_locks_[sensor_type];
    while (running_) {
        const std::optional<WorkItem> item = queue.WaitAndPop(running_);
        if (!item) {
            return;
        }
        // The queue's mutex is released: a worker never holds it with its sensor lock.
        std::lock_guard<std::mutex> lock(sensor_lock);
        ServiceModeParams& params = ParamsForMode(item->mode);
        ATRACE_BEGIN(item->enable ? "vyr enable work" : "vyr disable work");
        if (item->enable) {
            EnableWork(*item, &params, sensor_type);
        } else {
            DisableWork(*item, &params, sensor_type);
        }
        ATRACE_END();
        TraceModeCounters(params);
        {
            std::lock_guard<std::mutex> shown(params.shown_mutex);
            params.shown_enable_count = params.enable_count;
            params.shown_periods = params.periods;
        }
        queue.CountApplied();
    }
}

void VYRService::EnableWork(const WorkItem& item, ServiceModeParams* params,
                            unsigned int sensor_type) {
    params->mode = item.mode;
    ++params->enable_count;
    params->periods[item.handle] = item.period;
    const int32_t active_period = params->periods.size() == 1
                                      ? item.period
                                      : std::min(params->active_period.load(), item.period);
    params->active_period = active_period;
    ALOGI("%s mode %d, enable count %d, handle:%x sampling/active period %d/%d, sensor type:%d",
          __func__, item.mode, params->enable_count, item.handle, item.period, active_period,
          sensor_type);

    bool started = true;
    if (item.mode == kRangeMode) {
        started = range_sensor_->Init() == 0;
        range_sensor_->Enable(true);
        range_initialized_ = started;
        range_enabled_ = true;
    } else if (item.mode == kAlsMode) {
        if (params->enable_count == 1) {
            als_sensor_->enabled = true;
        }
    }
    params->running = true;
    if (started && !params->process_thread.joinable()) {
        params->process_thread = std::thread(&VYRService::ProcessLoop, this, params);
    }
}

void VYRService::DisableWork(const WorkItem& item, ServiceModeParams* params,
                             unsigned int sensor_type) {
    --params->enable_count;
    params->periods.erase(item.handle);
    if (params->enable_count < 1) {
        if (params->enable_count < 0) {
            ALOGW("%s: mode %d enable count becomes negative (%d)", __func__, item.mode,
                  params->enable_count);
        }
        params->running = false;
        if (item.mode == kRangeMode) {
            range_sensor_->Enable(false);
            range_enabled_ = false;
        } else if (item.mode == kAlsMode) {
            als_sensor_->enabled = false;
        }
        // Taking the mutex once keeps the notification from falling between WaitFor's test of
        // `running` and its wait.
        { std::lock_guard<std::mutex> lock(params->wait_mutex); }
        params->wait_cv.notify_all();
        if (params->process_thread.joinable()) {
            params->process_thread.join();
        }
    } else {
        int32_t active_period = kMaxRecomputedPeriodMs;
        for (const auto& [handle, period] : params->periods) {
            active_period = std::min(active_period, period);
        }
        params->active_period = active_period;
    }
    ALOGI("%s mode %d, enable count %d, handle:%x, active_period:%d, sensor type:%d", __func__,
          item.mode, params->enable_count, item.handle, params->active_period.load(), sensor_type);
    if (item.mode == kRangeMode) {
        range_sensor_->Uninit();
        range_initialized_ = false;
    }
}

void VYRService::TraceModeCounters(const ServiceModeParams& params) {
    // One counter track per mode, named as the README lists them.
    if (params.mode == kRangeMode) {
        ATRACE_INT("vyr mode 3 enable count", params.enable_count);
        ATRACE_INT("vyr mode 3 active period ms", params.active_period);
    } else if (params.mode == kAlsMode) {
        ATRACE_INT("vyr mode 1 enable count", params.enable_count);
        ATRACE_INT("vyr mode 1 active period ms", params.active_period);
    }
}

// Sampling.

void VYRService::ProcessLoop(ServiceModeParams* params) {
    ALSResult reading{};
    MultiRangingData data{};
    do {
        const auto start = std::chrono::steady_clock::now();
        int32_t mode = params->mode;
        const int32_t period = params->active_period;
        if (mode == kAlsMode || mode == kRangeMode) {
            if (mode == kAlsMode) {
                ATRACE_BEGIN("vyr als read");
                als_sensor_->ReadSingleShot(&reading, kAlsReadWait, kAlsIntegrationMs);
            } else {
                ATRACE_BEGIN("vyr range read");
                range_sensor_->Process(kRangeProcessMode, &data);
            }
            // As the library returns the reading: the time a camera frame can be matched to.
            const int64_t boottime_ns = BootTimeNs();
            ATRACE_END();
            // A reading taken across a disable is stale for whoever enables next.
            if (!params->running) {
                return;
            }
            std::lock_guard<std::mutex> lock(params->data_mutex);
            params->boottime_ns = boottime_ns;
            if (mode == kAlsMode) {
                params->als_data = reading;
            } else {
                params->range_data = data;
            }
            params->polled_handles.clear();
            EventDelivery::SampleStored(*params);
            ++params->samples;
            if ((mode == kAlsMode ? reading.valid : data.valid) == 0) ++params->invalid_samples;
            params->last_sample_ns = std::chrono::duration_cast<std::chrono::nanoseconds>(
                                         std::chrono::steady_clock::now().time_since_epoch())
                                         .count();
        }

        const int64_t remaining = period - MillisSince(start);
        mode = params->mode;
        if (mode != kRangeMode && remaining > kLowPowerWakeMarginMs && mode == kAlsMode &&
            low_power_ && num_clients_ == 1) {
            const auto off_start = std::chrono::steady_clock::now();
            als_sensor_->Disable();
            WaitFor(params, static_cast<int32_t>(remaining - kLowPowerWakeMarginMs));
            const int64_t rest = remaining - MillisSince(off_start);
            if (rest >= 1) {
                WaitFor(params, static_cast<int32_t>(rest));
            }
        } else if (remaining >= 1) {
            WaitFor(params, static_cast<int32_t>(remaining));
        }
    } while (params->running.load(std::memory_order_acquire));
}

void VYRService::WaitFor(ServiceModeParams* params, int32_t ms) {
    std::unique_lock<std::mutex> lock(params->wait_mutex);
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(ms);
    while (true) {
        if (!params->running.load(std::memory_order_acquire)) {
            return;
        }
        const auto now = std::chrono::steady_clock::now();
        if (now < deadline) {
            params->wait_cv.wait_until(lock, SystemDeadline(deadline - now));
        }
        if (std::chrono::steady_clock::now() >= deadline) {
            return;
        }
    }
}

// Display state.

void VYRService::MonitorDisplayStatus(const std::string& path) {
    base::unique_fd fd(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (fd.get() < 0) {
        ALOGE("vyrservice cannot open the display state file for reading.: %s", strerror(errno));
        NoteDisplayState("ended: cannot open " + path + ": " + strerror(errno), "");
        return;
    }
    if (als_sensor_ == nullptr) {
        ALOGE("%s: ALS sensor unavailable", __func__);
        NoteDisplayState("ended: no light sensor", "");
        return;
    }
    NoteDisplayState("watching " + path, "");
    bool lit = false;
    char buffer[kDisplayStateBufferSize];
    while (running_) {
        // sysfs signals a changed attribute with POLLPRI.
        pollfd pfd{fd.get(), POLLPRI, 0};
        poll(&pfd, 1, -1);
        if ((pfd.revents & POLLPRI) == 0) {
            continue;
        }
        memset(buffer, 0, sizeof(buffer));
        lseek(fd.get(), 0, SEEK_SET);
        const ssize_t count = read(fd.get(), buffer, sizeof(buffer));
        if (count < 0) {
            ALOGE("vyrservice failed to read display state file: %s", strerror(errno));
            NoteDisplayState("watching " + path, std::string("read failed: ") + strerror(errno));
            if (lit) {
                work_queues_[kAlsSensorType].PushAndSignal(
                    WorkItem{false, kAlsMode, display_handle_, 0});
            }
            lit = false;
            continue;
        }
        buffer[std::min<size_t>(count, sizeof(buffer) - 1)] = '\0';
        const std::string state(buffer);
        const bool now_lit =
            state.find("On") != std::string::npos || state.find("HBM") != std::string::npos;
        const std::string shown = state.substr(0, state.find_last_not_of('\n') + 1);
        NoteDisplayState("watching " + path, shown);
        if (now_lit != lit) {
            RecordEvent(std::string("display ") + (now_lit ? "lit" : "dark") + ": " + shown);
        }
        if (now_lit && !lit) {
            ALOGI("Enable sensor for display state: %s", state.c_str());
            work_queues_[kAlsSensorType].PushAndSignal(
                WorkItem{true, kAlsMode, display_handle_, kDisplayPeriodMs});
        } else if (!now_lit && lit) {
            ALOGI("Disable sensor for display state: %s", state.c_str());
            work_queues_[kAlsSensorType].PushAndSignal(
                WorkItem{false, kAlsMode, display_handle_, 0});
        }
        lit = now_lit;
    }
}

// Data path.

ndk::ScopedAStatus VYRService::PollOnce(int32_t handle, Event* event, int32_t* result) {
    LOCK_API();
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        ALOGE("%s, invalid handle", __func__);
        *result = -EINVAL;
        return Ok();
    }
    NoteCaller(it->second.get());
    *result = delivery_.PollInternal(handle, it->second->mode, event) ? 0 : -ENODATA;
    if (*result != 0) ++it->second->polls_refused;
    return Ok();
}

// Process entry.

void CreateAndRegisterService() {
    CreateAndRegisterService(nullptr);
}

void CreateAndRegisterService(const std::function<void(VYRService&)>& prepare) {
    // The service lives for the whole process whatever the registration's outcome, so that its
    // threads keep running and no exit path destroys it under them.
    static auto* const service = new std::shared_ptr<VYRService>(
        ndk::SharedRefBase::make<VYRService>(ServiceConfig::Production()));
    if (prepare) prepare(**service);
    ndk::SpAIBinder binder = (*service)->asBinder();
    const binder_status_t status = AServiceManager_addService(binder.get(), kServiceName);
    if (status != STATUS_OK) {
        ALOGE("Failed to add vyrService with status: %d", status);
    }
}

void JoinThreadPool() {
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
