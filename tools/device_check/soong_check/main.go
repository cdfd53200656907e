// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

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

	"github.com/google/blueprint"
	"github.com/google/blueprint/proptools"
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
	name: "android.vyr-V3-ndk",
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
license_kind {
	name: "SPDX-license-identifier-Apache-2.0",
	conditions: ["notice"],
	url: "https://spdx.org/licenses/Apache-2.0.html",
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

// The licence module types came to Soong after Debian's snapshot: these stand-ins take their
// properties and resolve what they name, so a misspelt licence, a licence kind that the platform
// does not have or a licence text that does not exist still fails.
type licenseDepTag struct{ blueprint.BaseDependencyTag }

type licenseKind struct {
	android.ModuleBase
	properties struct {
		Conditions []string
		Url        string
	}
}

func licenseKindFactory() android.Module {
	m := &licenseKind{}
	m.AddProperties(&m.properties)
	android.InitAndroidModule(m)
	return m
}

func (m *licenseKind) GenerateAndroidBuildActions(ctx android.ModuleContext) {}

type license struct {
	android.ModuleBase
	properties struct {
		License_kinds    []string
		License_text     []string
		Copyright_notice *string
		Package_name     *string
	}
}

func licenseFactory() android.Module {
	m := &license{}
	m.AddProperties(&m.properties)
	android.InitAndroidModule(m)
	return m
}

func (m *license) DepsMutator(ctx android.BottomUpMutatorContext) {
	ctx.AddDependency(ctx.Module(), licenseDepTag{}, m.properties.License_kinds...)
}

// The files of the tree, by path from its root. Soong's test context takes any source path as
// existing, so the licence text is looked up here.
var treeFiles map[string][]byte

func (m *license) GenerateAndroidBuildActions(ctx android.ModuleContext) {
	for _, text := range m.properties.License_text {
		if _, ok := treeFiles[filepath.Join(ctx.ModuleDir(), text)]; !ok {
			ctx.PropertyErrorf("license_text", "%q does not exist", text)
		}
	}
}

// packageModule stands in for the package module: one per Android.bp, named after its folder.
type packageModule struct {
	android.ModuleBase
	properties struct {
		Default_visibility          []string
		Default_applicable_licenses []string
	}
}

func packageFactory() android.Module {
	m := &packageModule{}
	m.AddProperties(&m.properties)
	android.InitAndroidModule(m)
	android.AddLoadHook(m, func(ctx android.LoadHookContext) {
		ctx.AppendProperties(&struct{ Name *string }{proptools.StringPtr("//" + ctx.ModuleDir())})
	})
	return m
}

func (m *packageModule) DepsMutator(ctx android.BottomUpMutatorContext) {
	ctx.AddDependency(ctx.Module(), licenseDepTag{}, m.properties.Default_applicable_licenses...)
}

func (m *packageModule) GenerateAndroidBuildActions(ctx android.ModuleContext) {}

func main() {
	if len(os.Args) != 2 {
		fmt.Fprintln(os.Stderr, "usage: soong_check ROOT")
		os.Exit(2)
	}
	// Walk does not follow a root that is a symbolic link: walk the folder it points to.
	root, err := filepath.EvalSymlinks(os.Args[1])
	if err != nil {
		fmt.Fprintln(os.Stderr, "soong_check:", err)
		os.Exit(2)
	}
	files := map[string][]byte{}
	treeFiles = files
	var blueprints []string
	err = filepath.Walk(root, func(path string, info os.FileInfo, err error) error {
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
	ctx.RegisterModuleType("license_kind", licenseKindFactory)
	ctx.RegisterModuleType("license", licenseFactory)
	ctx.RegisterModuleType("package", packageFactory)
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
