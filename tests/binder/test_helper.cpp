// The peer process of the cross-process tests.
//   binder_test_helper serve <name>            publishes a TestService as <name> and an echo
//                                              binder as <name>.echo, then serves for ever
//   binder_test_helper client <name>           hands a RecordingCallback to <name> and waits
#include <android/binder_manager.h>
#include <android/binder_process.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "echo_binder.h"
#include "test_service.h"

namespace {

using aidl::android::vyr::IVYRService;
using vyr_binder_test::RecordingCallback;
using vyr_binder_test::TestService;

int Serve(const std::string& name) {
    auto service = ndk::SharedRefBase::make<TestService>();
    if (AServiceManager_addService(service->asBinder().get(), name.c_str()) != EX_NONE) return 2;
    ndk::SpAIBinder echo = vyr_binder_test::MakeEcho();
    if (AServiceManager_addService(echo.get(), (name + ".echo").c_str()) != EX_NONE) return 2;
    ABinderProcess_startThreadPool();
    ABinderProcess_joinThreadPool();
    return 1;
}

int Client(const std::string& name) {
    ABinderProcess_startThreadPool();
    ndk::SpAIBinder binder(AServiceManager_getService(name.c_str()));
    std::shared_ptr<IVYRService> service = IVYRService::fromBinder(binder);
    if (service == nullptr) return 2;
    auto callback = ndk::SharedRefBase::make<RecordingCallback>();
    int32_t result = 0;
    if (!service->SetCallback(0, callback, &result).isOk()) return 3;
    for (;;) pause();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 3 && strcmp(argv[1], "serve") == 0) return Serve(argv[2]);
    if (argc == 3 && strcmp(argv[1], "client") == 0) return Client(argv[2]);
    fprintf(stderr, "usage: %s serve|client <name>\n", argv[0]);
    return 64;
}
