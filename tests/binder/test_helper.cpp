// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// The peer process of the cross-process tests.
//   binder_test_helper serve <name>            publishes a TestService as <name> and an echo
//                                              binder as <name>.echo, then serves for ever
//   binder_test_helper client <name>           hands a RecordingCallback to <name> and waits
//   binder_test_helper nopool <name>           without a thread pool: exits 0 when calls nested
//                                              in its own call arrive and others do not
//   binder_test_helper watch <name>            links to the death of <name>, then creates
//                                              <name>.linked.<pid> in VYR_BINDER_DIR; exits 0
//                                              when the death notice comes
//   binder_test_helper latepool <name>         as watch, without a thread pool: once <name> is
//                                              dead, exits 5 if a notice came all the same,
//                                              else starts the pool and exits 0 when it comes
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "echo_binder.h"
#include "test_service.h"

namespace vyr_test::binder {
namespace {

using aidl::android::vyr::IVYRService;

int Serve(const std::string& name) {
    auto service = ndk::SharedRefBase::make<TestService>();
    if (AServiceManager_addService(service->asBinder().get(), name.c_str()) != EX_NONE) return 2;
    ndk::SpAIBinder echo = vyr_test::binder::MakeEcho();
    if (AServiceManager_addService(echo.get(), (name + ".echo").c_str()) != EX_NONE) return 2;
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
    return 1;
}

int Client(const std::string& name) {
    ABinderProcess_startThreadPool();
    ndk::SpAIBinder binder(AServiceManager_waitForService(name.c_str()));
    std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
    if (service == nullptr) return 2;
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    if (!service->SetCallback(0, callback, &result).isOk()) return 3;
    for (;;) pause();
}

int NoPool(const std::string& name) {
    ndk::SpAIBinder binder(AServiceManager_waitForService(name.c_str()));
    std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
    if (service == nullptr) return 2;
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    // Delivered while this thread waits for the reply.
    if (!service->SetCallback(2, callback, &result).isOk() || callback->events().size() != 2) {
        return 3;
    }
    // Sent from another service thread later: nothing here serves it.
    if (!service->Close(1).isOk()) return 4;
    usleep(300 * 1000);
    return callback->events().size() == 2 ? 0 : 5;
}

void ExitOnDeath(void* /*cookie*/) {
    _exit(0);
}

// Links `on_died` to the death of the service `name`, then tells the test so; 0 or the exit
// status of the step that failed.
int LinkAndTell(const std::string& name, AIBinder_DeathRecipient_onBinderDied on_died,
                ndk::SpAIBinder* binder, ndk::ScopedAIBinder_DeathRecipient* recipient) {
    *binder = ndk::SpAIBinder(AServiceManager_waitForService(name.c_str()));
    if (binder->get() == nullptr) return 2;
    recipient->set(AIBinder_DeathRecipient_new(on_died));
    if (AIBinder_linkToDeath(binder->get(), recipient->get(), nullptr) != STATUS_OK) return 3;
    const char* dir = getenv("VYR_BINDER_DIR");
    const std::string marker = std::string(dir != nullptr ? dir : "/tmp") + "/" + name +
                               ".linked." + std::to_string(getpid());
    int fd = open(marker.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600);
    if (fd < 0) return 4;
    close(fd);
    return 0;
}

int Watch(const std::string& name) {
    ABinderProcess_startThreadPool();
    ndk::SpAIBinder binder;
    ndk::ScopedAIBinder_DeathRecipient recipient;
    if (int failed = LinkAndTell(name, &ExitOnDeath, &binder, &recipient)) return failed;
    for (;;) pause();
}

std::atomic<int> g_deaths{0};

void CountDeath(void* /*cookie*/) {
    ++g_deaths;
}

int LatePool(const std::string& name) {
    ndk::SpAIBinder binder;
    ndk::ScopedAIBinder_DeathRecipient recipient;
    if (int failed = LinkAndTell(name, &CountDeath, &binder, &recipient)) return failed;
    // The proxy is dead as soon as the runtime reads the hang-up, pool or not.
    while (AIBinder_isAlive(binder.get())) usleep(1000);
    // A notice would need a pool thread, and there is none.
    usleep(300 * 1000);
    if (g_deaths != 0) return 5;
    ABinderProcess_startThreadPool();
    for (int waited_ms = 0; waited_ms < 10000 && g_deaths == 0; ++waited_ms) usleep(1000);
    return g_deaths == 1 ? 0 : 6;
}

}  // namespace
}  // namespace vyr_test::binder

int main(int argc, char** argv) {
    using namespace vyr_test::binder;
    if (argc == 3 && strcmp(argv[1], "serve") == 0) return Serve(argv[2]);
    if (argc == 3 && strcmp(argv[1], "client") == 0) return Client(argv[2]);
    if (argc == 3 && strcmp(argv[1], "nopool") == 0) return NoPool(argv[2]);
    if (argc == 3 && strcmp(argv[1], "watch") == 0) return Watch(argv[2]);
    if (argc == 3 && strcmp(argv[1], "latepool") == 0) return LatePool(argv[2]);
    fprintf(stderr, "usage: %s serve|client|nopool|watch|latepool <name>\n", argv[0]);
    return 64;
}
