#include <android/binder_manager.h>

#include <string>

#include "process_state.h"

namespace {

// Names as service managers accept them: letters, digits and "._-/", at most 127 characters.
bool IsValidName(const char* instance) {
    if (instance == nullptr) return false;
    std::string name(instance);
    if (name.empty() || name.size() > 127) return false;
    for (char c : name) {
        bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                  c == '.' || c == '_' || c == '-' || c == '/';
        if (!ok) return false;
    }
    return true;
}

}  // namespace

binder_exception_t AServiceManager_addService(AIBinder* binder, const char* instance) {
    if (binder == nullptr || !IsValidName(instance)) return EX_ILLEGAL_ARGUMENT;
    AIBinder_incStrong(binder);
    vyr_binder::ProcessState::Get().AddLocalService(instance, ndk::SpAIBinder(binder));
    return EX_NONE;
}

AIBinder* AServiceManager_checkService(const char* instance) {
    if (!IsValidName(instance)) return nullptr;
    ndk::SpAIBinder found = vyr_binder::ProcessState::Get().FindLocalService(instance);
    AIBinder_incStrong(found.get());
    return found.get();
}

AIBinder* AServiceManager_getService(const char* instance) {
    return AServiceManager_checkService(instance);
}

AIBinder* AServiceManager_waitForService(const char* instance) {
    return AServiceManager_checkService(instance);
}

bool AServiceManager_isDeclared(const char* instance) {
    AIBinder* binder = AServiceManager_checkService(instance);
    AIBinder_decStrong(binder);
    return binder != nullptr;
}
