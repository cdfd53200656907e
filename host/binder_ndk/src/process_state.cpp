#include "process_state.h"

#include <vyr/binder_host.h>

#include <utility>

namespace vyr_binder {

ProcessState& ProcessState::Get() {
    static ProcessState* state = new ProcessState;
    return *state;
}

void ProcessState::AddLocalService(const std::string& name, const ndk::SpAIBinder& binder) {
    std::lock_guard<std::mutex> lock(services_mutex_);
    services_[name] = binder;
}

ndk::SpAIBinder ProcessState::FindLocalService(const std::string& name) {
    std::lock_guard<std::mutex> lock(services_mutex_);
    auto it = services_.find(name);
    return it == services_.end() ? ndk::SpAIBinder() : it->second;
}

void ProcessState::Shutdown() {
    pool_.Shutdown();
    std::map<std::string, ndk::SpAIBinder> services;
    {
        std::lock_guard<std::mutex> lock(services_mutex_);
        services.swap(services_);
    }
}

}  // namespace vyr_binder

void VyrBinder_shutdown(void) {
    vyr_binder::ProcessState::Get().Shutdown();
}
