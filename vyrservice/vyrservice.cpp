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

#include "control_settings.h"
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

// The sensor when its property is on and it could be made, else null with the warning that the
// service has always given; `presence` says why it is absent, for the dump.
template <typename Sensor>
Sensor* CreateSensor(bool wanted, const char* property, const char* absent_log,
                     std::string* presence) {
    Sensor* sensor = wanted ? Sensor::Create() : nullptr;
    if (!wanted) {
        *presence = std::string("absent: ") + property + " is off";
    } else {
        *presence = sensor != nullptr ? "present" : "absent: Create() failed";
    }
    if (sensor == nullptr) ALOGW("%s", absent_log);
    return sensor;
}

}  // namespace

VYRService::VYRService(const ServiceConfig& config) {
    display_handle_ = NewHandleLocked();
    std::this_thread::sleep_for(config.startup_delay);
    worker_threads_.reserve(2);

    const bool als_wanted = config.get_bool_property(kAlsProperty, false);
    std::string als_presence;
    als_sensor_ = CreateSensor<AmbientLightSensor>(
        als_wanted, kAlsProperty, "SpectralSensor::Create() returned NULL.", &als_presence);
    if (als_wanted) {
        // Also without the sensor, so that the monitor says in the log why it cannot serve.
        dump_state_.NoteDisplay("starting", "");
        display_thread_ =
            std::thread(&VYRService::MonitorDisplayStatus, this, config.display_state_path);
    }
    if (als_sensor_ != nullptr) StartWorker(kAlsSensorType);

    std::string range_presence;
    range_sensor_ = CreateSensor<ubk::RangeSensor>(
        config.get_bool_property(kRangeProperty, true), kRangeProperty,
        "ubk::RangeSensor::Create() returned NULL.", &range_presence);
    if (range_sensor_ != nullptr) StartWorker(kRangeSensorType);
    dump_state_.SetPresence(std::move(als_presence), std::move(range_presence));

    clients_.reserve(kMaxClients);
}

VYRService::~VYRService() {
    // First, so that no process exit reaches a service that is going away.
    client_processes_.Stop();
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
    // client is released here, its thread joined before its callback goes. The death links go
    // with their registry, after this.
    for (auto& [handle, entry] : clients_) {
        entry->Disable();
        entry->callback.reset();
    }
}

int32_t VYRService::NewHandleLocked() {
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
        const int32_t handle = NewHandleLocked();
        auto entry = std::make_shared<ClientEntry>(mode);
        std::string opened =
            "open handle " + std::to_string(handle) + " mode " + std::to_string(mode);
        client_processes_.NoteCaller(&entry->users);
        if (!entry->users.processes.empty()) {
            entry->users.opener_pid = entry->users.processes.begin()->second;
            opened += " pid " + std::to_string(entry->users.opener_pid);
        }
        clients_.emplace(handle, std::move(entry));
        ++num_clients_;
        *result = handle;
        dump_state_.RecordEvent(std::move(opened));
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
    dump_state_.RecordEvent("close handle " + std::to_string(handle));
    // Closed while enabled (Disable is the client's to call first): its ring is written no more.
    LeaveRingLocked(*entry);
    DeathLinkRegistry::Unlink(entry.get());
    client_processes_.Forget(entry->users, clients_);
    death_links_.Sweep();
    // Its death handler joins the thread and drops the callback after releasing the API lock.
    if (entry->AwaitsJoin()) return;
    if (entry->delivery.on_sample) {
        // The thread holds the entry and its own reference to the callback.
        after_unlock->Add(entry->StopAndHandOver());
    } else {
        // The notification thread stops before the callback is dropped; one that is running
        // this very call (from OnEvent) keeps the entry until it has ended.
        entry->Disable();
    }
    entry->callback.reset();
}

std::shared_ptr<ClientEntry> VYRService::CallerEntryLocked(const char* method, int32_t handle,
                                                           android_LogPriority priority,
                                                           int32_t error, int32_t* result) {
    auto it = clients_.find(handle);
    if (it == clients_.end()) {
        LOG_PRI(priority, LOG_TAG, "%s invalid handle %d", method, handle);
        *result = error;
        return nullptr;
    }
    client_processes_.NoteCaller(&it->second->users);
    return it->second;
}

// Enable, disable and low power.

std::shared_ptr<ClientEntry> VYRService::EnableTargetLocked(const char* method, int32_t handle,
                                                            int32_t* result) {
    const std::shared_ptr<ClientEntry> found =
        CallerEntryLocked(method, handle, ANDROID_LOG_ERROR, -ENOSYS, result);
    if (found == nullptr) return nullptr;
    if (found->state == kClientEnabled) {
        *result = -EEXIST;
        return nullptr;
    }
    return found;
}

ndk::ScopedAStatus VYRService::Enable(int32_t handle, int32_t period, int32_t* result) {
    LOCK_API();
    std::shared_ptr<ClientEntry> target = EnableTargetLocked(__func__, handle, result);
    if (target == nullptr) return Ok();
    ClientEntry& entry = *target;
    ALOGI("%s handle %d, mode %d", __func__, handle, entry.mode);
    entry.period = period >= 1 ? period : kDefaultPeriodMs;
    entry.delivery.on_sample = false;
    entry.delivery.max_report_latency = 0;
    StartClientLocked(handle, target);
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::EnableOnSample(int32_t handle, int32_t period,
                                              int32_t max_report_latency, int32_t* result) {
    LearnCallbackVersion(handle);
    LOCK_API();
    std::shared_ptr<ClientEntry> target = EnableTargetLocked(__func__, handle, result);
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
    entry.delivery.on_sample = true;
    entry.delivery.max_report_latency = max_report_latency;
    StartClientLocked(handle, target);
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::EnableRing(int32_t handle, int32_t period,
                                          ndk::ScopedFileDescriptor* ring, int32_t* result) {
    LOCK_API();
    std::shared_ptr<ClientEntry> target = EnableTargetLocked(__func__, handle, result);
    if (target == nullptr) return Ok();
    ClientEntry& entry = *target;
    if ((entry.mode == kAlsMode ? static_cast<void*>(als_sensor_)
                                : static_cast<void*>(range_sensor_)) == nullptr) {
        ALOGE("%s handle %d: mode %d has no sensor", __func__, handle, entry.mode);
        *result = -ENODEV;
        return Ok();
    }
    ndk::ScopedFileDescriptor reader = RingReaderLocked(entry.mode);
    if (reader.get() < 0) {
        *result = -ENOMEM;
        return Ok();
    }
    ALOGI("%s handle %d, mode %d", __func__, handle, entry.mode);
    entry.period = period >= 1 ? period : kDefaultPeriodMs;
    entry.delivery.on_sample = false;
    entry.delivery.max_report_latency = 0;
    entry.delivery.ring = true;
    ServiceModeParams& params = ParamsForMode(entry.mode);
    {
        std::lock_guard<std::mutex> lock(params.data_mutex);
        ++params.feed.ring_clients;
    }
    StartClientLocked(handle, target);
    *ring = std::move(reader);
    *result = 0;
    return Ok();
}

ndk::ScopedFileDescriptor VYRService::RingReaderLocked(int32_t mode) {
    ServiceModeParams& params = ParamsForMode(mode);
    std::shared_ptr<SampleRing> ring;
    {
        std::lock_guard<std::mutex> lock(params.data_mutex);
        ring = params.feed.ring;
    }
    if (ring == nullptr) {
        // Made outside data_mutex, which the processing loop takes for every sample; the API
        // lock keeps a second EnableRing from making another.
        std::string error;
        ring = SampleRing::Create(mode, VYR_RING_CAPACITY, &error);
        if (ring == nullptr) {
            ALOGE("EnableRing: cannot make the ring of mode %d: %s", mode, error.c_str());
            return ndk::ScopedFileDescriptor();
        }
        std::lock_guard<std::mutex> lock(params.data_mutex);
        params.feed.ring = ring;
    }
    ndk::ScopedFileDescriptor reader = ring->ReaderFd();
    if (reader.get() < 0) {
        ALOGE("EnableRing: cannot pass on the ring of mode %d: %s", mode, strerror(errno));
    }
    return reader;
}

void VYRService::LeaveRingLocked(ClientEntry& entry) {
    if (!entry.delivery.ring) return;
    entry.delivery.ring = false;
    ServiceModeParams& params = ParamsForMode(entry.mode);
    std::lock_guard<std::mutex> lock(params.data_mutex);
    --params.feed.ring_clients;
}

void VYRService::LearnCallbackVersion(int32_t handle) {
    std::shared_ptr<IEventCallback> callback;
    {
        LOCK_API();
        auto it = clients_.find(handle);
        if (it == clients_.end() || !it->second->callback ||
            it->second->delivery.callback_version != 0) {
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
        it->second->delivery.callback_version = version;
    }
}

int32_t VYRService::CallbackVersion(const ClientEntry& entry) {
    // Not known yet (replaced while being asked): none of version 2's methods for it.
    return std::max(entry.delivery.callback_version, 1);
}

void VYRService::StartClientLocked(int32_t handle, const std::shared_ptr<ClientEntry>& entry) {
    delivery_.Start(handle, entry);
    QueueForMode(entry->mode).PushAndSignal(WorkItem{true, entry->mode, handle, entry->period});
    dump_state_.RecordEvent("enable handle " + std::to_string(handle) + " period " +
                            std::to_string(entry->period));
}

ndk::ScopedAStatus VYRService::Flush(int32_t handle, int32_t* result) {
    LOCK_API();
    const std::shared_ptr<ClientEntry> found =
        CallerEntryLocked(__func__, handle, ANDROID_LOG_ERROR, -ENOSYS, result);
    if (found == nullptr) return Ok();
    ClientEntry& entry = *found;
    if (entry.state != kClientEnabled || !entry.delivery.sample_queue) {
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
    entry.delivery.sample_queue->Flush();
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::Disable(int32_t handle) {
    DeferredJoin after_unlock;
    LOCK_API();
    auto it = clients_.find(handle);
    if (it != clients_.end()) client_processes_.NoteCaller(&it->second->users);
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
    LeaveRingLocked(entry);
    if (client_died) {
        entry.StopNotify();
    } else if (entry.delivery.on_sample) {
        after_unlock->Add(entry.StopAndHandOver());
    } else {
        // A version 1 client's thread is joined under the API lock.
        entry.Disable();
    }
    QueueForMode(entry.mode).PushAndSignal(WorkItem{false, entry.mode, handle, 0});
    dump_state_.RecordEvent("disable handle " + std::to_string(handle));
}

ndk::ScopedAStatus VYRService::EnableLowPower(int32_t handle, bool enable, int32_t* result) {
    LOCK_API();
    const std::shared_ptr<ClientEntry> found =
        CallerEntryLocked(__func__, handle, ANDROID_LOG_ERROR, -ENOSYS, result);
    if (found == nullptr) return Ok();
    ClientEntry& entry = *found;
    if (entry.mode == kRangeMode) {
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
    const std::shared_ptr<ClientEntry> found =
        CallerEntryLocked(__func__, handle, ANDROID_LOG_WARN, -EINVAL, result);
    if (found == nullptr) return Ok();
    ClientEntry& entry = *found;
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
    DeathLinkRegistry::Unlink(&entry);
    entry.callback = callback;
    entry.delivery.callback_version = 0;
    entry.callback_binder = entry.callback->asBinder();
    death_links_.Link(&entry);
    death_links_.Sweep();
    *result = 0;
    return Ok();
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
            ReleaseDeadClientLocked(it->first, "callback", &released, &after_unlock);
    }
    FinishRelease(&released);
}

void VYRService::ReleaseDeadClientLocked(int32_t handle, const std::string& cause,
                                         std::vector<std::shared_ptr<ClientEntry>>* released,
                                         DeferredJoin* after_unlock) {
    std::shared_ptr<ClientEntry> entry = clients_.at(handle);
    ALOGI("client %d mode %d died; disable sensor and remove client handle", handle, entry->mode);
    dump_state_.RecordEvent("death of handle " + std::to_string(handle) + " (" + cause + ")");
    // Its binder is dead: the link is let go, not removed, so that its notice still comes.
    DeathLinkRegistry::LetGo(entry.get());
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
            if (ClientProcesses::EndsLastUse(entry.get(), id)) handles.push_back(handle);
        }
        // The same record and clean-up as a death notice.
        for (int32_t handle : handles) {
            ALOGI("Receive binder death callback");
            ReleaseDeadClientLocked(handle, "process " + std::to_string(pid), &released,
                                    &after_unlock);
        }
    }
    FinishRelease(&released);
}

// Sensor parameters and torch state.

ndk::ScopedAStatus VYRService::ConfigureParameters(int32_t handle,
                                                   const std::vector<int32_t>& params,
                                                   int32_t* result) {
    LOCK_API();
    const std::shared_ptr<ClientEntry> found =
        CallerEntryLocked(__func__, handle, ANDROID_LOG_ERROR, -ENOSYS, result);
    if (found == nullptr) return Ok();
    ClientEntry& entry = *found;
    const int32_t mode = entry.mode;
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
    range_sensor_->ConfigureParameters(ToControlSettings(params));
    *result = 0;
    return Ok();
}

ndk::ScopedAStatus VYRService::SetTorchLightState(int32_t state) {
    LOCK_API();
    if (als_sensor_ != nullptr) {
        als_sensor_->SetTorchLightState(static_cast<unsigned char>(state));
        dump_state_.NoteTorch(state);
        ALOGI("torch state changed to %d", state);
    }
    return Ok();
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
    client_processes_.NoteCaller(&it->second->users);
    *result = delivery_.PollInternal(handle, it->second->mode, event) ? 0 : -ENODATA;
    if (*result != 0) ++it->second->counters.polls_refused;
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
