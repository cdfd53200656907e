// soong_check loads the project's Android.bp files into Soong's own test context, with the
// platform libraries that a device tree provides declared as stand-ins, and fails on what Soong
// would refuse: an unknown module type or property, a property of the wrong type, a missing
// dependency, or a vendor module that depends on a library a vendor module may not use.
//
//	soong_check ROOT
//
// Built against Debian's golang-android-soong-dev (GOPATH mode).
package main

import (
	"fmt"
	"io/ioutil"
	"os"
	"path/filepath"
	"strings"

	"android/soong/android"
	"android/soong/cc"
)

// What the device tree and the platform provide: libraries as the modules name them, and the
// defaults of the platform's binder fuzzers.
const platformStandIns = `
cc_library {
	name: "libbinder_ndk",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "libbase",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library_headers {
	name: "libbase_headers",
	vendor_available: true,
}
cc_library {
	name: "libcutils",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "liblog",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "libtinyxml2",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "libambient_light_sensor",
	vendor: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "libubk_range_sensor",
	vendor: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library {
	name: "android.vyr-V2-ndk",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library_static {
	name: "libbinder_random_parcel",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_defaults {
	name: "service_fuzzer_defaults",
	static_libs: ["libbinder_random_parcel"],
}
cc_library_static {
	name: "libgtest",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library_static {
	name: "libgtest_main",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
cc_library_static {
	name: "libgmock",
	vendor_available: true,
	nocrt: true,
	system_shared_libs: [],
	stl: "none",
}
`

// aidlInterface stands in for the aidl build's module type, which Soong's core does not have:
// it takes the properties the interface module uses, so a misspelt one still fails.
type aidlInterface struct {
	android.ModuleBase
	properties struct {
		Vendor_available  *bool
		Srcs              []string
		Local_include_dir string
		Frozen            *bool
		Backend           struct {
			Cpp, Java, Ndk, Rust struct {
				Enabled *bool
			}
		}
		Versions_with_info []struct {
			Version string
			Imports []string
		}
	}
}

func aidlInterfaceFactory() android.Module {
	m := &aidlInterface{}
	m.AddProperties(&m.properties)
	android.InitAndroidModule(m)
	return m
}

func (m *aidlInterface) GenerateAndroidBuildActions(ctx android.ModuleContext) {}

func main() {
	if len(os.Args) != 2 {
		fmt.Fprintln(os.Stderr, "usage: soong_check ROOT")
		os.Exit(2)
	}
	root := os.Args[1]
	files := map[string][]byte{}
	var blueprints []string
	err := filepath.Walk(root, func(path string, info os.FileInfo, err error) error {
		if err != nil {
			return err
		}
		rel, _ := filepath.Rel(root, path)
		if info.IsDir() {
			if rel == "build" || rel == ".git" {
				return filepath.SkipDir
			}
			return nil
		}
		data, err := ioutil.ReadFile(path)
		if err != nil {
			return err
		}
		files[rel] = data
		if info.Name() == "Android.bp" {
			blueprints = append(blueprints, rel)
		}
		return nil
	})
	if err != nil {
		fmt.Fprintln(os.Stderr, "soong_check:", err)
		os.Exit(2)
	}
	// The compiler's and the C library's own modules, which Soong's test context declares.
	files["platform/Android.bp"] = []byte(platformStandIns + cc.GatherRequiredDepsForTest(android.Android))
	blueprints = append(blueprints, "platform/Android.bp")

	buildDir, err := ioutil.TempDir("", "soong_check")
	if err != nil {
		fmt.Fprintln(os.Stderr, "soong_check:", err)
		os.Exit(2)
	}
	defer os.RemoveAll(buildDir)

	config := cc.TestConfig(buildDir, android.Android, nil, "", files)
	ctx := cc.CreateTestContext()
	ctx.RegisterModuleType("aidl_interface", aidlInterfaceFactory)
	ctx.Register(config)

	report := func(stage string, errs []error) {
		if len(errs) == 0 {
			return
		}
		for _, e := range errs {
			fmt.Println(strings.TrimSpace(e.Error()))
		}
		fmt.Printf("soong: FAIL (%s)\n", stage)
		os.Exit(1)
	}
	_, errs := ctx.ParseFileList(".", blueprints)
	report("parse", errs)
	_, errs = ctx.ResolveDependencies(config)
	report("dependencies", errs)
	_, errs = ctx.PrepareBuildActions(config)
	report("build actions", errs)
	fmt.Printf("soong: %d Android.bp files load in Soong's test context\n", len(blueprints)-1)
}
