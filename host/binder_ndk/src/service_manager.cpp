#include <android/binder_manager.h>

#include <chrono>
#include <string>
#include <thread>

#include "process_state.h"
#include "registry.h"

namespace {

using vyr_binder::ProcessState;
using vyr_binder::Registry;

// getService waits this long for a name to appear, as the platform's lookup does for a service
// that is still starting.
constexpr std::chrono::milliseconds kGetServiceWait(5000);

AIBinder* Released(ndk::SpAIBinder binder) {
    AIBinder* raw = binder.get();
    AIBinder_incStrong(raw);
    return raw;
}

AIBinder* LookupUntil(const char* instance, bool forever) {
    if (instance == nullptr || !Registry::IsValidName(instance)) return nullptr;
    auto deadline = std::chrono::steady_clock::now() + kGetServiceWait;
    std::chrono::milliseconds pause(1);
    for (;;) {
        ndk::SpAIBinder binder = ProcessState::Get().Lookup(instance);
        if (binder.get() != nullptr) return Released(binder);
        if (!forever && std::chrono::steady_clock::now() >= deadline) return nullptr;
        std::this_thread::sleep_for(pause);
        if (pause < std::chrono::milliseconds(50)) pause *= 2;
    }
}

}  // namespace

binder_exception_t AServiceManager_addService(AIBinder* binder, const char* instance) {
    if (binder == nullptr || instance == nullptr || !Registry::IsValidName(instance)) {
        return EX_ILLEGAL_ARGUMENT;
    }
    // Only objects of this process can be published.
    if (AIBinder_isRemote(binder)) return EX_ILLEGAL_ARGUMENT;
    AIBinder_incStrong(binder);
    return ProcessState::Get().Publish(instance, ndk::SpAIBinder(binder));
}

AIBinder* AServiceManager_checkService(const char* instance) {
    if (instance == nullptr || !Registry::IsValidName(instance)) return nullptr;
    return Released(ProcessState::Get().Lookup(instance));
}

AIBinder* AServiceManager_getService(const char* instance) {
    return LookupUntil(instance, false);
}

AIBinder* AServiceManager_waitForService(const char* instance) {
    return LookupUntil(instance, true);
}

bool AServiceManager_isDeclared(const char* instance) {
    AIBinder* binder = AServiceManager_checkService(instance);
    AIBinder_decStrong(binder);
    return binder != nullptr;
}
