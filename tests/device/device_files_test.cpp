// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>
#include <sys/wait.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "child_process.h"
#include "temp_dir.h"
#include "test_files.h"

namespace vyr_test::device {
namespace {

namespace fs = std::filesystem;

std::string ReadFile(const fs::path& path) {
    return vyr_test::ReadFile(path.string());
}

void WriteFile(const fs::path& path, const std::string& text) {
    fs::create_directories(path.parent_path());
    std::ofstream(path, std::ios::trunc) << text;
}

struct CheckResult {
    int exit_status = -1;
    std::string output;  // stdout and stderr
};

// Each test breaks one thing in its own copy of the source tree and runs the device check on it.
class DeviceFilesTest : public ::testing::Test {
  protected:
    void SetUp() override {
        tree_ = temp_.Path("tree");
        fs::create_directories(tree_);
        for (const fs::directory_entry& entry : fs::directory_iterator(VYR_SOURCE_DIR)) {
            const std::string name = entry.path().filename();
            if (name == "build" || name == ".git") continue;
            fs::copy(entry.path(), tree_ / name, fs::copy_options::recursive);
        }
    }

    CheckResult Check(const fs::path& root, std::vector<std::string> extra = {}) {
        // The Soong step as the build made it: a test compiles nothing.
        std::vector<std::string> argv = {std::string(VYR_SOURCE_DIR) + "/scripts/check-device",
                                         root.string(), "--soong-check", VYR_SOONG_CHECK};
        argv.insert(argv.end(), extra.begin(), extra.end());
        const std::string stderr_path = temp_.Path("stderr");
        CheckResult result;
        {
            vyr_test::ChildProcess child(argv, {}, stderr_path);
            EXPECT_TRUE(child.started());
            while (std::optional<std::string> line =
                       child.ReadLine(std::chrono::milliseconds(30000))) {
                result.output += *line + "\n";
            }
            const std::optional<int> status = child.Wait(std::chrono::milliseconds(30000));
            EXPECT_TRUE(status.has_value()) << "check-device did not end";
            if (status && WIFEXITED(*status)) result.exit_status = WEXITSTATUS(*status);
        }
        result.output += ReadFile(stderr_path);
        return result;
    }
    CheckResult CheckCopy() { return Check(tree_); }

    void Edit(const std::string& relative, const std::string& from, const std::string& to) {
        std::string text = ReadFile(tree_ / relative);
        const size_t at = text.find(from);
        ASSERT_NE(at, std::string::npos) << relative << " has no " << from;
        text.replace(at, from.size(), to);
        WriteFile(tree_ / relative, text);
    }
    void Append(const std::string& relative, const std::string& text) {
        WriteFile(tree_ / relative, ReadFile(tree_ / relative) + text);
    }
    // The host build's list of library sources, as if it had been configured on the copy.
    fs::path ParityFileOfCopy() {
        std::string text = ReadFile(VYR_DEVICE_PARITY_FILE);
        const std::string source_dir = std::string(VYR_SOURCE_DIR) + "/";
        for (size_t at = text.find(source_dir); at != std::string::npos;
             at = text.find(source_dir, at)) {
            text.replace(at, source_dir.size(), tree_.string() + "/");
            at += tree_.string().size() + 1;
        }
        const fs::path parity = temp_.Path("parity.txt");
        WriteFile(parity, text);
        return parity;
    }

    TempDir temp_;
    fs::path tree_;
};

#define EXPECT_FAILS_WITH(result, text)                                    \
    do {                                                                   \
        const CheckResult& r = (result);                                   \
        EXPECT_EQ(r.exit_status, 1) << r.output;                           \
        EXPECT_NE(r.output.find(text), std::string::npos) << r.output;     \
        EXPECT_NE(r.output.find("device files: FAIL"), std::string::npos); \
    } while (0)

TEST_F(DeviceFilesTest, TheCommittedTreeAndTheHostBuildPass) {
    const CheckResult result = Check(VYR_SOURCE_DIR, {"--cmake-sources", VYR_DEVICE_PARITY_FILE});
    EXPECT_EQ(result.exit_status, 0) << result.output;
    EXPECT_NE(result.output.find("device files: PASS"), std::string::npos) << result.output;
}

TEST_F(DeviceFilesTest, TheCopyPassesUnchanged) {
    const CheckResult result = Check(tree_, {"--cmake-sources", ParityFileOfCopy().string()});
    EXPECT_EQ(result.exit_status, 0) << result.output;
}

// A checkout under a linked home is reached through a symbolic link: every step walks the tree
// behind it.
TEST_F(DeviceFilesTest, TheCopyPassesThroughASymbolicLink) {
    const fs::path link = temp_.Path("link");
    fs::create_directory_symlink(tree_, link);
    const CheckResult result = Check(link);
    EXPECT_EQ(result.exit_status, 0) << result.output;
    EXPECT_NE(result.output.find("Android.bp files load in Soong's test context"), std::string::npos)
        << result.output;
}

TEST_F(DeviceFilesTest, ADefectBehindASymbolicLinkIsFound) {
    Edit("vyrservice/Android.bp", "    vendor: true,\n", "    vendor:true,\n");
    const fs::path link = temp_.Path("link");
    fs::create_directory_symlink(tree_, link);
    EXPECT_FAILS_WITH(Check(link), "vyrservice/Android.bp is not formatted");
}

TEST_F(DeviceFilesTest, AnAndroidBpThatBpfmtWouldReformatFails) {
    Edit("vyrservice/Android.bp", "    vendor: true,\n", "    vendor:true,\n");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice/Android.bp is not formatted");
}

TEST_F(DeviceFilesTest, AnAndroidBpThatDoesNotParseFails) {
    Append("sensors/Android.bp", "cc_library {\n    name: \n");
    EXPECT_FAILS_WITH(CheckCopy(), "sensors/Android.bp does not parse");
}

TEST_F(DeviceFilesTest, RemovingAMethodBreaksTheFrozenInterface) {
    Edit("aidl/android/vyr/IVYRService.aidl", "    void SetTorchLightState(int state);\n", "");
    const CheckResult result = CheckCopy();
    EXPECT_FAILS_WITH(result, "aidl/ is not a compatible extension of frozen version 1");
    EXPECT_NE(result.output.find("SetTorchLightState"), std::string::npos) << result.output;
}

TEST_F(DeviceFilesTest, WideningAFieldBreaksTheFrozenInterface) {
    Edit("aidl/android/vyr/Event.aidl", "long timestamp;", "double timestamp;");
    EXPECT_FAILS_WITH(CheckCopy(), "aidl/ is not a compatible extension of frozen version 1");
}

TEST_F(DeviceFilesTest, AddingAMethodWithoutUpdatingCurrentFails) {
    Edit("aidl/android/vyr/IVYRService.aidl", "    void SetTorchLightState(int state);\n",
         "    void SetTorchLightState(int state);\n    int Reset();\n");
    EXPECT_FAILS_WITH(CheckCopy(), "aidl_api/android.vyr/current differs from aidl/");
}

TEST_F(DeviceFilesTest, AnEditedFrozenDumpNoLongerMatchesItsHash) {
    Append("aidl_api/android.vyr/1/android/vyr/Event.aidl", "// edited\n");
    EXPECT_FAILS_WITH(CheckCopy(), "aidl_api/android.vyr/1/.hash does not match its files");
}

// A later version's hash ends with the previous version's number, as the platform's build checks
// it; one made with version 1's last line ("latest-version") is refused, with the right value.
TEST_F(DeviceFilesTest, AHashMadeByTheFirstVersionsRuleFailsForALaterVersion) {
    const fs::path dump = tree_ / "aidl_api/android.vyr/2";
    vyr_test::ChildProcess hash({"/bin/sh", "-c",
                                 "cd '" + dump.string() +
                                     "' && { find ./ -name '*.aidl' -print0 | LC_ALL=C sort -z | "
                                     "xargs -0 sha1sum && echo latest-version; } | sha1sum | "
                                     "cut -d ' ' -f 1"},
                                {}, temp_.Path("hash-stderr"));
    const std::optional<std::string> wrong = hash.ReadLine(std::chrono::milliseconds(30000));
    ASSERT_TRUE(wrong) << "no hash";
    const std::string right = ReadFile(dump / ".hash");
    ASSERT_NE(*wrong + "\n", right);
    WriteFile(dump / ".hash", *wrong + "\n");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "aidl_api/android.vyr/2/.hash does not match its files "
                      "(expected " +
                          right.substr(0, right.size() - 1) + ")");
}

TEST_F(DeviceFilesTest, AnUndeclaredTypeFails) {
    Append("sepolicy/vyrservice.te", "allow vyrservice vyr_camera_device:chr_file read;\n");
    EXPECT_FAILS_WITH(CheckCopy(), "type vyr_camera_device is used but not declared");
}

TEST_F(DeviceFilesTest, AContextWithAnUndeclaredTypeFails) {
    Edit("sepolicy/file_contexts", "vyrservice_exec", "vyrservice_binary");
    EXPECT_FAILS_WITH(CheckCopy(), "type vyrservice_binary is used but not declared");
}

TEST_F(DeviceFilesTest, AGenfsPathThatTheCodeDoesNotOpenFails) {
    Edit("sepolicy/genfs_contexts", "sysfs /class/backlight/panel0-backlight/state",
         "sysfs /class/backlight/panel1-backlight/state");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "/sys/class/backlight/panel1-backlight/state is not a path that the code "
                      "opens");
}

// vyrctl runs from adb shell only in a domain of its own: a vendor binary without a label would be
// vendor_file, which the shell may not execute.
TEST_F(DeviceFilesTest, AVendorBinaryWithoutALabelFails) {
    Edit("sepolicy/file_contexts", "/vendor/bin/vyrctl        u:object_r:vyrctl_exec:s0\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "/vendor/bin/vyrctl (cc_binary vyrctl) has no label");
}

TEST_F(DeviceFilesTest, APolicyThatLetsTheServiceCallTheShellFails) {
    Append("sepolicy/vyrservice.te", "userdebug_or_eng(`\n  binder_call(vyrservice, shell)\n')\n");
    EXPECT_FAILS_WITH(CheckCopy(), "binder_call(vyrservice, shell): the service calls back");
}

TEST_F(DeviceFilesTest, AnAllowRuleThatLetsTheServiceCallTheShellFails) {
    Append("sepolicy/vyrservice.te", "allow vyrservice shell:binder { call transfer };\n");
    EXPECT_FAILS_WITH(CheckCopy(), "the service may call shell over binder");
}

// The tree labels the backlight attribute by its /class link only; the checker says that the
// device tree must label the real path, and passes.
TEST_F(DeviceFilesTest, ABacklightLabelledOnlyByItsLinkIsWarnedOf) {
    const CheckResult result = CheckCopy();
    EXPECT_EQ(result.exit_status, 0) << result.output;
    EXPECT_NE(result.output.find("warning: sepolicy/genfs_contexts: "
                                 "/sys/class/backlight/panel0-backlight/state is labelled only by "
                                 "its /class path"),
              std::string::npos)
        << result.output;
}

TEST_F(DeviceFilesTest, AFileContextsPathThatNothingUsesFails) {
    Append("sepolicy/file_contexts", "/vendor/etc/vyr.conf    u:object_r:vyrservice_exec:s0\n");
    EXPECT_FAILS_WITH(CheckCopy(), "/vendor/etc/vyr.conf is neither the installed binary");
}

TEST_F(DeviceFilesTest, AServiceNameThatTheCodeDoesNotRegisterFails) {
    Edit("sepolicy/service_contexts", "vyrservice ", "vyr.service ");
    EXPECT_FAILS_WITH(CheckCopy(), "service vyr.service is not registered by the code");
}

TEST_F(DeviceFilesTest, ARegisteredNameWithoutServiceContextsEntryFails) {
    WriteFile(tree_ / "sepolicy/service_contexts", "");
    EXPECT_FAILS_WITH(CheckCopy(), "registered service vyrservice has no context");
}

TEST_F(DeviceFilesTest, ALabelThatIsNoServiceManagerTypeFails) {
    Edit("sepolicy/vyrservice.te", "type vyrservice_service, service_manager_type;",
         "type vyrservice_service, file_type;");
    EXPECT_FAILS_WITH(CheckCopy(), "does not declare a service_manager_type");
}

TEST_F(DeviceFilesTest, AVndserviceContextsBesideNdkRegistrationFails) {
    WriteFile(tree_ / "sepolicy/vndservice_contexts",
              "vyrservice    u:object_r:vyrservice_service:s0\n");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "sepolicy/vndservice_contexts: the code registers through libbinder_ndk");
}

TEST_F(DeviceFilesTest, VndbinderUseBesideNdkRegistrationFails) {
    Append("sepolicy/vyrservice.te", "vndbinder_use(vyrservice)\n");
    EXPECT_FAILS_WITH(CheckCopy(), "vndbinder_use(vyrservice): the code registers through");
}

TEST_F(DeviceFilesTest, AClientAttributeWithoutBinderUseFails) {
    Edit("sepolicy/vyrservice.te", "binder_use(vyrservice_client)\n", "");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "client vyrservice_client finds vyrservice_service but has no binder_use");
}

// The sample ring: the service's memfd has a type of its own, which its clients may receive over
// binder and map.
TEST_F(DeviceFilesTest, ARingClientThatMayNotMapTheServicesMemoryFails) {
    Edit("sepolicy/vyrservice.te",
         "allow vyrservice_client vyrservice_tmpfs:file { getattr map read write };\n", "");
    EXPECT_FAILS_WITH(
        CheckCopy(), "vyrservice_client lacks { getattr map read write } on vyrservice_tmpfs:file");
}

TEST_F(DeviceFilesTest, ARingClientWithoutTheMapPermissionFails) {
    Edit("sepolicy/vyrservice.te", "vyrservice_tmpfs:file { getattr map read write }",
         "vyrservice_tmpfs:file { getattr read write }");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice_client lacks { map } on vyrservice_tmpfs:file");
}

// Read-only as the mapping is, binder checks the write mode of the read-write descriptor.
TEST_F(DeviceFilesTest, ARingClientThatMayNotReceiveAWritableDescriptorFails) {
    Edit("sepolicy/vyrservice.te", "vyrservice_tmpfs:file { getattr map read write }",
         "vyrservice_tmpfs:file { getattr map read }");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice_client lacks { write } on vyrservice_tmpfs:file");
}

TEST_F(DeviceFilesTest, AServiceWhoseMemfdsAreNotLabelledFails) {
    Edit("sepolicy/vyrservice.te", "tmpfs_domain(vyrservice)\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "no tmpfs_domain(vyrservice)");
}

TEST_F(DeviceFilesTest, AClientThatMayNotUseTheServicesDescriptorsFails) {
    Edit("sepolicy/vyrservice.te", "binder_call(vyrservice_client, vyrservice)\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice_client may not use the descriptors of vyrservice");
}

TEST_F(DeviceFilesTest, AServiceDomainWithoutBinderUseFails) {
    Edit("sepolicy/vyrservice.te", "binder_use(vyrservice)\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice adds vyrservice_service but has no binder_use");
}

TEST_F(DeviceFilesTest, ARenamedRegistrationFails) {
    Edit("vyrservice/vyrservice.cpp", "kServiceName[] = \"vyrservice\"",
         "kServiceName[] = \"vyrservice2\"");
    EXPECT_FAILS_WITH(CheckCopy(), "registered service vyrservice2 has no context");
}

TEST_F(DeviceFilesTest, AnInitPathOtherThanTheInstallPathFails) {
    Edit("vyrservice/vyrservice.rc", "/vendor/bin/vyrservice", "/vendor/bin/hw/vyrservice");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "runs /vendor/bin/hw/vyrservice, but Android.bp installs the binary at "
                      "/vendor/bin/vyrservice");
}

TEST_F(DeviceFilesTest, AOneshotServiceFails) {
    Append("vyrservice/vyrservice.rc", "    oneshot\n");
    EXPECT_FAILS_WITH(CheckCopy(), "is oneshot: init would not restart it");
}

TEST_F(DeviceFilesTest, AServiceThatKeepsCapabilitiesFails) {
    Edit("vyrservice/vyrservice.rc", "    capabilities\n", "    capabilities SYS_NICE\n");
    EXPECT_FAILS_WITH(CheckCopy(), "does not drop every capability");
}

TEST_F(DeviceFilesTest, ASourceMissingFromAndroidBpFails) {
    WriteFile(tree_ / "vyrservice/display_monitor.cpp", "\n");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice/display_monitor.cpp: is in no module of Android.bp");
}

TEST_F(DeviceFilesTest, ASourceOnlyTheHostBuildCompilesFails) {
    const fs::path parity = ParityFileOfCopy();
    Edit(parity.string(), "vyrservice/work_queue.cpp",
         "vyrservice/work_queue.cpp;" + (tree_ / "vyrservice/host_only.cpp").string());
    const CheckResult result = Check(tree_, {"--cmake-sources", parity.string()});
    EXPECT_FAILS_WITH(result,
                      "vyrservice/host_only.cpp: is built into libvyrservice on the host "
                      "only");
}

TEST_F(DeviceFilesTest, ASourceOnlyTheDeviceBuildCompilesFails) {
    const fs::path parity = ParityFileOfCopy();
    Edit(parity.string(), ";" + (tree_ / "vyrservice/work_queue.cpp").string(), "");
    const CheckResult result = Check(tree_, {"--cmake-sources", parity.string()});
    EXPECT_FAILS_WITH(result,
                      "vyrservice/work_queue.cpp: is built into libvyrservice on the "
                      "device only");
}

TEST_F(DeviceFilesTest, AnAndroidBpInAHostOnlyFolderFails) {
    WriteFile(tree_ / "host/binder_ndk/Android.bp", "cc_library {\n    name: \"libx\",\n}\n");
    EXPECT_FAILS_WITH(CheckCopy(), "host/binder_ndk/Android.bp: a host-only folder");
}

TEST_F(DeviceFilesTest, AModuleThatReachesIntoTheHostRuntimeFails) {
    Edit("vyrservice/Android.bp", "        \"work_queue.cpp\",\n",
         "        \"work_queue.cpp\",\n        \"../host/properties/properties.cpp\",\n");
    EXPECT_FAILS_WITH(CheckCopy(), "libvyrservice reaches the host-only host/properties");
}

TEST_F(DeviceFilesTest, AVyrctlSourceMissingFromAndroidBpFails) {
    WriteFile(tree_ / "tools/vyrctl/record_command.cpp", "\n");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "tools/vyrctl/record_command.cpp: is in no module of Android.bp");
}

TEST_F(DeviceFilesTest, AModuleWithoutThreadSafetyAnalysisFails) {
    Edit("Android.bp", "        \"-Wthread-safety\",\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "libvyrservice is built without -Wthread-safety");
}

TEST_F(DeviceFilesTest, AModuleWithoutMinSdkVersionFails) {
    Edit("Android.bp", "    min_sdk_version: \"34\",\n", "");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice has min_sdk_version None");
}

TEST_F(DeviceFilesTest, AMinSdkVersionBelowTheNdkCallsFails) {
    Edit("Android.bp", "    min_sdk_version: \"34\",", "    min_sdk_version: \"31\",");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice has min_sdk_version '31'");
}

TEST_F(DeviceFilesTest, AVendorAvailableClientLibraryFails) {
    Edit("client/Android.bp", "    vendor: true,", "    vendor_available: true,");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "libvyrclient is vendor_available, but the interface is not VINTF-stable");
}

TEST_F(DeviceFilesTest, AFuzzerOnTheSensorLibrariesFails) {
    Edit("tests/service/Android.bp", "        \"libvyr_sensor_doubles\",\n", "");
    Edit("tests/service/Android.bp", "    srcs: [\"fuzz/vyrservice_fuzzer.cpp\"],\n",
         "    srcs: [\"fuzz/vyrservice_fuzzer.cpp\"],\n    shared_libs: "
         "[\"libubk_range_sensor\"],\n");
    EXPECT_FAILS_WITH(CheckCopy(), "vyrservice_fuzzer links libubk_range_sensor");
}

TEST_F(DeviceFilesTest, AnAndroidBpWithoutTheLicenceFails) {
    Edit("client/Android.bp",
         "package {\n    default_applicable_licenses: [\"vyrservice_license\"],\n}\n\n", "");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "client/Android.bp: has no package { default_applicable_licenses }");
}

TEST_F(DeviceFilesTest, AMisspeltLicenceFails) {
    Edit("client/Android.bp", "\"vyrservice_license\"", "\"vyrservice_licence\"");
    const CheckResult result = CheckCopy();
    EXPECT_FAILS_WITH(result, "applies vyrservice_licence, which is no license module");
    EXPECT_NE(result.output.find("depends on undefined module \"vyrservice_licence\""),
              std::string::npos)
        << result.output;
}

TEST_F(DeviceFilesTest, AMissingLicenceTextFailsInSoong) {
    fs::remove(tree_ / "LICENSE");
    EXPECT_FAILS_WITH(CheckCopy(), "license_text: \"LICENSE\" does not exist");
}

TEST_F(DeviceFilesTest, ALicenceKindThatThePlatformDoesNotHaveFailsInSoong) {
    Edit("Android.bp", "SPDX-license-identifier-Apache-2.0", "SPDX-license-identifier-Apache2");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "depends on undefined module \"SPDX-license-identifier-Apache2\"");
}

TEST_F(DeviceFilesTest, ASourceFileWithoutTheLicenceHeaderFails) {
    WriteFile(tree_ / "host/properties/property_cache.h", "#pragma once\n");
    EXPECT_FAILS_WITH(CheckCopy(), "host/properties/property_cache.h: has no licence header");
}

TEST_F(DeviceFilesTest, AnEditedLicenceHeaderFails) {
    Edit("aidl/android/vyr/Event.aidl", "SPDX-License-Identifier: Apache-2.0",
         "SPDX-License-Identifier: MIT");
    EXPECT_FAILS_WITH(CheckCopy(), "aidl/android/vyr/Event.aidl: has no licence header");
}

TEST_F(DeviceFilesTest, AScriptWithoutTheLicenceHeaderFails) {
    WriteFile(tree_ / "scripts/bisect", "#!/usr/bin/env bash\necho bisect\n");
    EXPECT_FAILS_WITH(CheckCopy(), "scripts/bisect: has no licence header");
}

TEST_F(DeviceFilesTest, TheLicenceHeaderFollowsTheShebangLine) {
    WriteFile(tree_ / "scripts/bisect",
              "#!/usr/bin/env bash\n# Copyright (C) 2026 The vyrservice Authors\n"
              "# SPDX-License-Identifier: Apache-2.0\n\necho bisect\n");
    const CheckResult result = CheckCopy();
    EXPECT_EQ(result.exit_status, 0) << result.output;
}

TEST_F(DeviceFilesTest, ACcTestMissingFromTestMappingFails) {
    Edit("TEST_MAPPING", "    {\n      \"name\": \"vyrservice_event_parcel_tests\"\n    }\n", "");
    Edit("TEST_MAPPING", "},\n  ]", "}\n  ]");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "TEST_MAPPING: cc_test vyrservice_event_parcel_tests is not mapped");
}

TEST_F(DeviceFilesTest, ATestMappingEntryForNoModuleFails) {
    Edit("TEST_MAPPING", "\"vyrservice_apex_tests\"", "\"vyrservice_gone_tests\"");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "TEST_MAPPING: names vyrservice_gone_tests, which no Android.bp");
}

TEST_F(DeviceFilesTest, ACcTestWithoutTestSuitesFails) {
    Edit("tests/service/Android.bp", "    test_suites: [\"device-tests\"],\n", "");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "cc_test vyrservice_event_conversion_tests names no test_suites");
}

TEST_F(DeviceFilesTest, AnUnknownPropertyFailsInSoong) {
    Edit("apex_update_listener/Android.bp", "    vendor_available: true,",
         "    vendor_availble: true,");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "apex_update_listener/Android.bp:9:20: unrecognized property "
                      "\"vendor_availble\"");
}

TEST_F(DeviceFilesTest, APropertyOfTheWrongTypeFailsInSoong) {
    Edit("apex_update_listener/Android.bp", "    vendor_available: true,",
         "    vendor_available: \"yes\",");
    EXPECT_FAILS_WITH(CheckCopy(),
                      "can't assign string value to bool property \"vendor_available\"");
}

TEST_F(DeviceFilesTest, AnUnknownModuleTypeFailsInSoong) {
    Edit("client/Android.bp", "cc_library {", "cc_libary {");
    EXPECT_FAILS_WITH(CheckCopy(), "unrecognized module type \"cc_libary\"");
}

TEST_F(DeviceFilesTest, AMissingDependencyFailsInSoong) {
    Edit("client/Android.bp", "        \"libbinder_ndk\",\n",
         "        \"libbinder_ndk\",\n        \"libnothere\",\n");
    EXPECT_FAILS_WITH(CheckCopy(), "depends on undefined module \"libnothere\"");
}

}  // namespace
}  // namespace vyr_test::device
