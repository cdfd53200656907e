#!/usr/bin/env python3
# Copyright (C) 2026 The vyrservice Authors
# SPDX-License-Identifier: Apache-2.0

"""Checks the device build files against each other and against the code.

  check_device_files.py ROOT [--cmake-sources FILE]

- every SELinux type, attribute or property type that the policy uses is declared by the policy
  or is one of the platform's (PLATFORM_TYPES);
- every path in file_contexts and genfs_contexts is the installed binary or a path the code opens;
- every vendor binary that is not only a test's data has a file_contexts label (else it is
  vendor_file, which adb shell may not execute);
- the service's domain calls no shell (its clients, vyrctl among them, have domains of their own);
- a warning when genfs_contexts labels a sysfs file only by a path under /class, which is usually
  a link: sysfs labels the real path under /devices, which the device tree must label;
- the policy is written for the binder that the code registers on: libbinder_ndk always reaches
  servicemanager on /dev/binder, so service_contexts labels every name that the code registers
  (and nothing else) with a service_manager_type, the registering domain and every client
  attribute have binder_use, and no vndservice_contexts or vndbinder_use is left;
- a service that hands out shared memory (the sample ring, made with libcutils' ashmem) labels its
  memfds with a type of its own (<domain>_tmpfs, tmpfs_domain), and every client attribute that
  calls it may use its descriptors (fd use) and receive and map that type;
- the init service runs the path where Android.bp installs the vendor binary that carries the .rc;
- every .cpp of the service, the listener, the client library, vyrctl and the sensor doubles is
  in Android.bp, and (with --cmake-sources, written by the host build) the host build compiles the
  same sources for each library;
- every C++ module is built with -Wthread-safety and min_sdk_version 34 or later, none is
  vendor_available while the interface is not VINTF-stable, and no fuzzer links a sensor library;
- no Android.bp exists in, or points into, a host-only folder;
- every Android.bp applies the tree's Apache-2.0 license module (package
  { default_applicable_licenses });
- every source file starts with the licence header (licence_header.py);
- every cc_test names its test suites and is in the root TEST_MAPPING, which names no module that
  does not exist.

Prints one line per defect and exits 1 if there is any.
"""

import argparse
import json
import os
import re
import sys

import licence_header

# Types and attributes of the platform policy (system/sepolicy) that this policy uses.
PLATFORM_TYPES = {
    "adbd",
    "apex_info_file",
    "apex_mnt_dir",
    "devpts",
    "domain",
    "dumpstate",
    "exec_type",
    "file_type",
    "fs_type",
    "service_manager_type",
    "shell",
    "sysfs_type",
    "vendor_file_type",
}
# Policy macros that declare their first argument.
DECLARING_MACROS = {"vendor_internal_prop", "vendor_restricted_prop", "vendor_public_prop"}
# Policy macros whose argument is policy kept for some builds only (m4 quoted).
BUILD_VARIANT_MACROS = ("userdebug_or_eng", "eng", "user_only")
# Folders that only the host build uses.
HOST_ONLY = ["host", "sensors/simulator", "tools/sandbox"]
# Folders whose every .cpp belongs to a library or binary of both builds (the service, the
# listener, the client library).
SERVICE_FOLDERS = ["vyrservice", "apex_update_listener", "client"]
# Further folders whose every .cpp is in a module of the device build: vyrctl, and the sensor
# doubles that the device fuzzer runs on.
DEVICE_FOLDERS = SERVICE_FOLDERS + ["tools/vyrctl", "sensors/doubles"]
# Module types that compile C++ of this tree.
CC_MODULE_TYPES = {"cc_library", "cc_library_static", "cc_library_shared", "cc_binary", "cc_test",
                   "cc_fuzz"}
# What a client needs of the service's memfd type to receive the ring's read-write descriptor over
# binder (read and write: binder checks each access mode of a descriptor it passes) and map it
# (getattr for its size, map).
RING_CLIENT_PERMISSIONS = {"getattr", "map", "read", "write"}
# The call that makes the shared memory that the service hands its clients.
SHARED_MEMORY_CALL = "ashmem_create_region"
# The closed sensor libraries: what only the service binary may link.
SENSOR_LIBRARIES = {"libambient_light_sensor", "libubk_range_sensor"}
# The lowest platform version whose NDK has every call that the code makes.
MIN_SDK_VERSION = 34
# A vendor cc_binary is installed here.
VENDOR_BIN = "/vendor/bin/"


class Checker:
    def __init__(self, root):
        self.root = root
        self.defects = []
        self.warnings = []

    def defect(self, where, text):
        self.defects.append(f"{where}: {text}")

    def warn(self, where, text):
        self.warnings.append(f"warning: {where}: {text}")

    def read(self, relative):
        with open(os.path.join(self.root, relative), encoding="utf-8") as f:
            return f.read()

    def exists(self, relative):
        return os.path.exists(os.path.join(self.root, relative))


# --- Blueprint -----------------------------------------------------------------------------------


class BlueprintParser:
    """Modules of one Android.bp: {"type", "props"} with strings, bools, lists and maps."""

    TOKEN = re.compile(r'\s*(?://[^\n]*|/\*.*?\*/|"(?:\\.|[^"\\])*"|[A-Za-z_][\w.]*|-?\d+|\S)',
                       re.S)

    def __init__(self, text, where):
        self.where = where
        self.tokens = [t for t in self.TOKEN.findall(text)
                       if t.strip() and not t.lstrip().startswith(("//", "/*"))]
        self.tokens = [t.strip() for t in self.tokens]
        self.pos = 0

    def peek(self):
        return self.tokens[self.pos] if self.pos < len(self.tokens) else None

    def take(self, expected=None):
        token = self.peek()
        if token is None or (expected is not None and token != expected):
            raise ValueError(f"{self.where}: expected {expected!r}, found {token!r}")
        self.pos += 1
        return token

    def modules(self):
        result = []
        while self.peek() is not None:
            name = self.take()
            if self.peek() == "=" or self.peek() == "+":
                while self.peek() != "=":
                    self.take()
                self.take("=")
                self.value()
                continue
            result.append({"type": name, "props": self.map_body()})
        return result

    def map_body(self):
        self.take("{")
        props = {}
        while self.peek() != "}":
            key = self.take()
            self.take(":")
            props[key] = self.value()
            if self.peek() == ",":
                self.take(",")
        self.take("}")
        return props

    def value(self):
        token = self.peek()
        if token == "{":
            result = self.map_body()
        elif token == "[":
            self.take("[")
            result = []
            while self.peek() != "]":
                result.append(self.value())
                if self.peek() == ",":
                    self.take(",")
            self.take("]")
        elif token.startswith('"'):
            result = self.take()[1:-1]
        elif token in ("true", "false"):
            result = self.take() == "true"
        else:
            result = self.take()
        if self.peek() == "+":
            self.take("+")
            other = self.value()
            result = result + other if type(result) is type(other) else result
        return result


def android_bp_files(root):
    found = []
    for directory, subdirs, files in os.walk(root):
        subdirs[:] = [d for d in subdirs if d not in (".git", "build")]
        if "Android.bp" in files:
            found.append(os.path.relpath(os.path.join(directory, "Android.bp"), root))
    return sorted(found)


def load_modules(checker):
    modules = []
    for bp in android_bp_files(checker.root):
        try:
            parsed = BlueprintParser(checker.read(bp), bp).modules()
        except (ValueError, AttributeError) as error:
            checker.defect(bp, f"cannot parse: {error}")
            continue
        for module in parsed:
            module["dir"] = os.path.dirname(bp)
            module["file"] = bp
            modules.append(module)
    defaults = {m["props"].get("name"): m["props"] for m in modules if m["type"] == "cc_defaults"}
    for module in modules:
        apply_defaults(module["props"], defaults, set())
    return modules


def apply_defaults(props, defaults, seen):
    """Merges the properties of the defaults that props names, and of those that they name."""
    for name in props.get("defaults", []):
        if name in seen or name not in defaults:
            continue
        seen.add(name)
        inherited = dict(defaults[name])
        apply_defaults(inherited, defaults, seen)
        for key, value in inherited.items():
            own = props.get(key)
            if key in ("name", "defaults"):
                continue
            if own is None:
                props[key] = value
            elif isinstance(own, list) and isinstance(value, list):
                props[key] = value + [v for v in own if v not in value]


def strings_in(value):
    if isinstance(value, str):
        yield value
    elif isinstance(value, list):
        for item in value:
            yield from strings_in(item)
    elif isinstance(value, dict):
        for item in value.values():
            yield from strings_in(item)


# --- What the code does --------------------------------------------------------------------------


def code_files(checker):
    files = []
    for folder in SERVICE_FOLDERS:
        path = os.path.join(checker.root, folder)
        if os.path.isdir(path):
            files += [os.path.join(folder, f) for f in sorted(os.listdir(path))
                      if f.endswith((".cpp", ".h"))]
    return files


def code_paths(checker):
    """Absolute file paths written as string literals in the service's code."""
    paths = set()
    for relative in code_files(checker):
        paths.update(re.findall(r'"(/(?:sys|apex|dev|proc|data|vendor)/[^"\s]*)"',
                                checker.read(relative)))
    return paths


def registered_service_names(checker):
    names = set()
    for relative in code_files(checker):
        text = checker.read(relative)
        for argument in re.findall(r"AServiceManager_addService\s*\([^,]*,\s*([^)]+?)\s*\)", text):
            if argument.startswith('"'):
                names.add(argument.strip('"'))
                continue
            constant = re.search(r"\b" + re.escape(argument) + r'\s*\[\s*\]\s*=\s*"([^"]*)"',
                                 text)
            if constant:
                names.add(constant.group(1))
    return names


# --- Policy --------------------------------------------------------------------------------------


def policy_files(checker, suffix=None, name=None):
    folder = os.path.join(checker.root, "sepolicy")
    if not os.path.isdir(folder):
        return []
    return [os.path.join("sepolicy", f) for f in sorted(os.listdir(folder))
            if (suffix and f.endswith(suffix)) or f == name]


def without_comments(text):
    return re.sub(r"#[^\n]*", "", text)


def policy_text(checker, te):
    """A .te file without comments, with the rules of build-variant macros unwrapped."""
    text = without_comments(checker.read(te))
    return re.sub(r"\b(?:" + "|".join(BUILD_VARIANT_MACROS) + r")\s*\(\s*`(.*?)'\s*\)", r"\1",
                  text, flags=re.S)


def macro_calls(text, macro):
    """The argument lists of every call of one policy macro."""
    return [[a.strip() for a in arguments.split(",")]
            for arguments in re.findall(r"\b" + macro + r"\s*\(([^)]*)\)", text)]


def context_type(context):
    parts = context.split(":")
    return parts[2] if len(parts) >= 4 else None


def check_policy_types(checker):
    declared, used = set(), []
    for te in policy_files(checker, suffix=".te"):
        text = policy_text(checker, te)
        for kind, body in re.findall(r"\b(type|attribute|typeattribute)\s+([^;]+);", text):
            names = [n.strip() for n in body.split(",")]
            if kind == "typeattribute":
                used += [(te, n) for n in names]
            else:
                declared.add(names[0])
                used += [(te, n) for n in names[1:]]
        for macro, arguments in re.findall(r"\b(\w+)\s*\(([^)]*)\)", text):
            names = [a.strip() for a in arguments.split(",") if a.strip()]
            if macro in DECLARING_MACROS and names:
                declared.add(names[0])
            used += [(te, n) for n in names]
        for rule in re.findall(r"\b(?:allow|dontaudit|auditallow)\s+([^;]+);", text):
            subjects, _, _ = rule.partition(":")
            used += [(te, n) for n in re.findall(r"[A-Za-z_]\w*", subjects)]
    for contexts in policy_files(checker, suffix="_contexts"):
        for line in without_comments(checker.read(contexts)).splitlines():
            for field in line.split():
                if field.startswith("u:"):
                    used.append((contexts, context_type(field)))
    for where, name in used:
        if name not in declared and name not in PLATFORM_TYPES:
            checker.defect(where, f"type {name} is used but not declared")


def check_policy_paths(checker, binary_paths):
    opened = code_paths(checker)
    for contexts in policy_files(checker, name="file_contexts"):
        for line in without_comments(checker.read(contexts)).splitlines():
            fields = line.split()
            if not fields:
                continue
            path = fields[0]
            if path not in binary_paths and path not in opened:
                checker.defect(contexts, f"{path} is neither the installed binary nor a path "
                                         "that the code opens")
    for contexts in policy_files(checker, name="genfs_contexts"):
        for line in without_comments(checker.read(contexts)).splitlines():
            fields = line.split()
            if len(fields) < 4 or fields[0] != "genfscon":
                continue
            mount = {"sysfs": "/sys", "proc": "/proc"}.get(fields[1], "/" + fields[1])
            path = mount + fields[2]
            if path not in opened:
                checker.defect(contexts, f"{path} is not a path that the code opens")


def check_binary_labels(checker, modules):
    """Every vendor binary installed for its own sake runs in a domain of the policy."""
    test_data = set()
    for module in modules:
        if module["type"] == "cc_test":
            test_data.update(d.lstrip(":") for d in module["props"].get("data", []))
    labelled = {path for path, _ in context_entries(checker, "file_contexts")}
    for module in modules:
        name = module["props"].get("name", "")
        if module["type"] != "cc_binary" or name in test_data:
            continue
        path = VENDOR_BIN + name
        if path not in labelled:
            checker.defect("sepolicy/file_contexts", f"{path} (cc_binary {name}) has no label: it "
                                                     "would be vendor_file, which no domain may "
                                                     "execute from adb shell")


def service_domains(texts):
    return {arguments[0] for text in texts.values()
            for arguments in macro_calls(text, "init_daemon_domain") if arguments}


def check_no_calls_into_shell(checker):
    texts = {te: policy_text(checker, te) for te in policy_files(checker, suffix=".te")}
    services = service_domains(texts)
    for te, text in texts.items():
        for arguments in macro_calls(text, "binder_call"):
            if len(arguments) == 2 and arguments[0] in services and arguments[1] == "shell":
                checker.defect(te, f"binder_call({arguments[0]}, shell): the service calls back "
                                   "its clients' domains, never the shell")
        for subjects, targets in re.findall(r"\ballow\s+([^;:]+?)\s+([^;:]+?)\s*:\s*binder\b",
                                            text):
            if (set(re.findall(r"\w+", subjects)) & services
                    and "shell" in re.findall(r"\w+", targets)):
                checker.defect(te, "the service may call shell over binder: the service calls back "
                                   "its clients' domains, never the shell")


def declared_names(texts):
    return {body.split(",")[0].strip() for text in texts.values()
            for _, body in re.findall(r"\b(type|attribute)\s+([^;]+);", text)}


def allowed_permissions(texts, subject, target, cls):
    """The permissions that allow rules give subject on target:cls, sets and attributes named as
    they are written (no expansion)."""
    permissions = set()
    rule = re.compile(r"\ballow\s+(\{[^}]*\}|\S+)\s+(\{[^}]*\}|[^\s:]+)\s*:\s*(\{[^}]*\}|\w+)\s+"
                      r"(\{[^}]*\}|\w+)\s*;")
    for text in texts.values():
        for subjects, targets, classes, perms in rule.findall(text):
            if (subject in re.findall(r"\w+", subjects) and target in re.findall(r"\w+", targets)
                    and cls in re.findall(r"\w+", classes)):
                permissions.update(re.findall(r"\w+", perms))
    return permissions


def added_services(texts, domain):
    """The service_manager types that `domain` adds."""
    return {arguments[1] for text in texts.values()
            for arguments in macro_calls(text, "add_service")
            if len(arguments) == 2 and arguments[0] == domain}


def client_attributes(texts, domain, attributes):
    """The attributes that may find a name that `domain` adds: its clients."""
    names = added_services(texts, domain)
    clients = set()
    for text in texts.values():
        for subjects, target in re.findall(
                r"\ballow\s+([^;:]+?)\s+(\w+)\s*:\s*service_manager\s+[^;]*\bfind\b", text):
            if target in names:
                clients.update(s for s in re.findall(r"\w+", subjects) if s in attributes)
    return sorted(clients)


def makes_shared_memory(checker, folder):
    for directory, _, files in os.walk(os.path.join(checker.root, folder)):
        for name in files:
            if name.endswith(".cpp"):
                relative = os.path.relpath(os.path.join(directory, name), checker.root)
                if SHARED_MEMORY_CALL in checker.read(relative):
                    return True
    return False


def check_ring_policy(checker):
    """The service's sample ring reaches its clients: a memfd labelled with the service's own
    tmpfs type, a descriptor that binder may pass on, a mapping the client may make."""
    if not makes_shared_memory(checker, "vyrservice"):
        return
    texts = {te: policy_text(checker, te) for te in policy_files(checker, suffix=".te")}
    declared = declared_names(texts)
    attributes = {body.strip() for text in texts.values()
                  for body in re.findall(r"\battribute\s+([^;]+);", text)}
    where = "sepolicy/vyrservice.te"
    for service in sorted(service_domains(texts)):
        memory = service + "_tmpfs"
        if memory not in declared:
            checker.defect(where, f"{memory} is not declared: the sample ring that {service} makes "
                                  "needs a type of its own for its clients to map")
        if not any(arguments == [service] for text in texts.values()
                   for arguments in macro_calls(text, "tmpfs_domain")):
            checker.defect(where, f"no tmpfs_domain({service}): the memfd of its sample ring would "
                                  f"be plain tmpfs, not {memory}")
        clients = client_attributes(texts, service, attributes)
        for client in clients:
            # binder_call(client, service) allows fd use among its rules.
            uses_fds = ("use" in allowed_permissions(texts, client, service, "fd")
                        or any(arguments == [client, service] for text in texts.values()
                               for arguments in macro_calls(text, "binder_call")))
            if not uses_fds:
                checker.defect(where, f"{client} may not use the descriptors of {service} (fd use, "
                                      f"as binder_call({client}, {service}) allows): binder would "
                                      "not pass it the sample ring")
            missing = RING_CLIENT_PERMISSIONS - allowed_permissions(texts, client, memory, "file")
            if missing:
                checker.defect(where, f"{client} lacks {{ {' '.join(sorted(missing))} }} on "
                                      f"{memory}:file: it cannot receive and map the sample ring")


def check_backlight_label(checker):
    paths = []
    for contexts in policy_files(checker, name="genfs_contexts"):
        for line in without_comments(checker.read(contexts)).splitlines():
            fields = line.split()
            if len(fields) >= 4 and fields[0] == "genfscon" and fields[1] == "sysfs":
                paths.append((contexts, fields[2]))
    if any(path.startswith("/devices/") for _, path in paths):
        return
    for contexts, path in paths:
        if path.startswith("/class/"):
            checker.warn(contexts, f"/sys{path} is labelled only by its /class path, usually a "
                                   "link; sysfs labels the real path under /sys/devices, which the "
                                   "device tree must label too")


def context_entries(checker, name):
    """(name, type) of every line of one of the policy's contexts files."""
    entries = []
    for contexts in policy_files(checker, name=name):
        for line in without_comments(checker.read(contexts)).splitlines():
            fields = line.split()
            if len(fields) >= 2:
                entries.append((fields[0], context_type(fields[1])))
    return entries


def check_binder_path(checker):
    registered = registered_service_names(checker)
    if not registered:
        checker.defect("vyrservice", "no AServiceManager_addService call with a name found")
        return
    # libbinder_ndk has no way to reach vndservicemanager: a vendor process that registers through
    # it talks /dev/binder, whose rules are binder_use and service_contexts.
    if policy_files(checker, name="vndservice_contexts"):
        checker.defect("sepolicy/vndservice_contexts", "the code registers through libbinder_ndk, "
                       "which reaches servicemanager, not vndservicemanager: label the name in "
                       "service_contexts")
    texts = {te: policy_text(checker, te) for te in policy_files(checker, suffix=".te")}
    for te, text in texts.items():
        for arguments in macro_calls(text, "vndbinder_use"):
            checker.defect(te, f"vndbinder_use({', '.join(arguments)}): the code registers through "
                               "libbinder_ndk, which uses /dev/binder (binder_use)")
    service_types = set()
    binder_users = set()
    for text in texts.values():
        for name, kinds in re.findall(r"\btype\s+(\w+)\s*,([^;]*);", text):
            if "service_manager_type" in [k.strip() for k in kinds.split(",")]:
                service_types.add(name)
        binder_users.update(arguments[0] for arguments in macro_calls(text, "binder_use"))
    entries = context_entries(checker, "service_contexts")
    listed = {name for name, _ in entries}
    for name, label in entries:
        if name not in registered:
            checker.defect("sepolicy/service_contexts", f"service {name} is not registered by the "
                                                        f"code (it registers {sorted(registered)})")
        if label not in service_types:
            checker.defect("sepolicy/service_contexts", f"{name} is labelled {label}, which the "
                                                        "policy does not declare a "
                                                        "service_manager_type")
    for name in sorted(registered - listed):
        checker.defect("sepolicy/service_contexts", f"registered service {name} has no context: "
                                                    "servicemanager would label it "
                                                    "default_android_service, which no vendor "
                                                    "domain may add")
    labels = {label for _, label in entries}
    for te, text in texts.items():
        for arguments in macro_calls(text, "add_service"):
            if len(arguments) == 2 and arguments[1] in labels and arguments[0] not in binder_users:
                checker.defect(te, f"{arguments[0]} adds {arguments[1]} but has no binder_use")
        # Whoever looks a service of this policy up is its client, and needs binder_use to reach
        # servicemanager at all.
        for subjects, target in re.findall(
                r"\ballow\s+([^;:]+?)\s+(\w+)\s*:\s*service_manager\s+[^;]*\bfind\b", text):
            if target not in labels:
                continue
            for subject in re.findall(r"[A-Za-z_]\w*", subjects):
                if subject not in binder_users and subject not in PLATFORM_TYPES:
                    checker.defect(te, f"client {subject} finds {target} but has no binder_use")


# --- init ----------------------------------------------------------------------------------------


def check_init_scripts(checker, modules):
    """Returns the install paths of the vendor binaries."""
    binary_paths = set()
    for module in modules:
        if module["type"] != "cc_binary":
            continue
        props = module["props"]
        if props.get("vendor") is not True:
            checker.defect(module["file"], f"cc_binary {props.get('name')} is not vendor: true")
            continue
        install_path = VENDOR_BIN + props.get("name", "")
        binary_paths.add(install_path)
        for rc in props.get("init_rc", []):
            rc_path = os.path.join(module["dir"], rc)
            if not checker.exists(rc_path):
                checker.defect(module["file"], f"init_rc {rc_path} does not exist")
                continue
            check_rc(checker, rc_path, install_path)
    return binary_paths


def check_rc(checker, rc_path, install_path):
    services = {}
    current = None
    for line in without_comments(checker.read(rc_path)).splitlines():
        fields = line.split()
        if not fields:
            continue
        if not line[:1].isspace():
            current = None
            if fields[0] == "service":
                current = fields[1] if len(fields) > 1 else ""
                services[current] = {"path": fields[2] if len(fields) > 2 else "", "options": {}}
        elif current is not None:
            services[current]["options"][fields[0]] = fields[1:]
    if not services:
        checker.defect(rc_path, "no service stanza")
    for name, service in services.items():
        options = service["options"]
        if service["path"] != install_path:
            checker.defect(rc_path, f"service {name} runs {service['path']}, but Android.bp "
                                    f"installs the binary at {install_path}")
        if "oneshot" in options:
            checker.defect(rc_path, f"service {name} is oneshot: init would not restart it")
        if options.get("user", ["root"])[0] == "root":
            checker.defect(rc_path, f"service {name} runs as root")
        if options.get("capabilities") != []:
            checker.defect(rc_path, f"service {name} does not drop every capability")


# --- Sources -------------------------------------------------------------------------------------


def check_sources(checker, modules, cmake_sources):
    listed = {}
    for module in modules:
        for source in module["props"].get("srcs", []):
            listed.setdefault(os.path.normpath(os.path.join(module["dir"], source)), []).append(
                module["props"].get("name"))
    for folder in DEVICE_FOLDERS:
        path = os.path.join(checker.root, folder)
        for directory, _, files in os.walk(path):
            for name in sorted(files):
                relative = os.path.relpath(os.path.join(directory, name), checker.root)
                if name.endswith(".cpp") and relative not in listed:
                    checker.defect(relative, "is in no module of Android.bp")
    if cmake_sources is None:
        return
    bp_modules = {m["props"].get("name"): m for m in modules}
    with open(cmake_sources, encoding="utf-8") as f:
        for line in f:
            module_name, _, sources = line.rstrip("\n").partition("\t")
            if not module_name:
                continue
            host = {os.path.relpath(s, checker.root) if os.path.isabs(s) else s
                    for s in sources.split(";") if s}
            module = bp_modules.get(module_name)
            if module is None:
                checker.defect("Android.bp", f"the host build's {module_name} has no module")
                continue
            device = {os.path.normpath(os.path.join(module["dir"], s))
                      for s in module["props"].get("srcs", [])}
            for source in sorted(host - device):
                checker.defect(source, f"is built into {module_name} on the host only")
            for source in sorted(device - host):
                checker.defect(source, f"is built into {module_name} on the device only")


def check_host_only(checker, modules):
    for folder in HOST_ONLY:
        for directory, _, files in os.walk(os.path.join(checker.root, folder)):
            if "Android.bp" in files:
                checker.defect(os.path.relpath(os.path.join(directory, "Android.bp"), checker.root),
                               "a host-only folder must stay out of the device build")
    for module in modules:
        for value in strings_in(module["props"]):
            target = os.path.normpath(os.path.join(module["dir"], value))
            if any(target == f or target.startswith(f + "/") for f in HOST_ONLY):
                checker.defect(module["file"], f"{module['props'].get('name')} reaches the "
                                               f"host-only {target}")


def check_conventions(checker, modules):
    """What a device tree expects of the modules: checked locks, the platform version, the
    partition that the interface's stability allows, and no hardware under a fuzzer."""
    stable = any(m["type"] == "aidl_interface" and m["props"].get("stability") == "vintf"
                 for m in modules)
    for module in modules:
        props = module["props"]
        name = props.get("name")
        if module["type"] not in CC_MODULE_TYPES:
            continue
        if "-Wthread-safety" not in props.get("cflags", []):
            checker.defect(module["file"], f"{name} is built without -Wthread-safety: its lock "
                                           "annotations would be checked on the host only")
        version = props.get("min_sdk_version")
        if not (isinstance(version, str) and version.isdigit()
                and int(version) >= MIN_SDK_VERSION):
            checker.defect(module["file"], f"{name} has min_sdk_version {version!r}; the NDK calls "
                                           f"of the code need {MIN_SDK_VERSION}")
        links_interface = any(re.fullmatch(r"android\.vyr-V\d+-ndk", library)
                              for library in props.get("shared_libs", []))
        if props.get("vendor_available") is True and links_interface and not stable:
            checker.defect(module["file"], f"{name} is vendor_available, but the interface is not "
                                           "VINTF-stable: a system process linking it would get "
                                           "BAD_TYPE on its first call (make it vendor: true)")
        if module["type"] == "cc_fuzz":
            linked = set(props.get("shared_libs", [])) | set(props.get("static_libs", []))
            for library in sorted(linked & SENSOR_LIBRARIES):
                checker.defect(module["file"], f"{name} links {library}: a fuzzer runs on the "
                                               "sensor doubles, never on the hardware")


def check_licences(checker, modules):
    """Every Android.bp applies the tree's licence module to its modules, as a device tree's
    build requires of every module."""
    licences = {m["props"].get("name"): m for m in modules if m["type"] == "license"}
    for name, module in licences.items():
        if "SPDX-license-identifier-Apache-2.0" not in module["props"].get("license_kinds", []):
            checker.defect(module["file"], f"license {name} is not Apache-2.0")
    for bp in android_bp_files(checker.root):
        packages = [m for m in modules if m["file"] == bp and m["type"] == "package"]
        applied = [name for m in packages
                   for name in m["props"].get("default_applicable_licenses", [])]
        if not applied:
            checker.defect(bp, "has no package { default_applicable_licenses } naming the "
                               "licence module")
        for name in applied:
            if name not in licences:
                checker.defect(bp, f"applies {name}, which is no license module of the tree")


def check_licence_headers(checker):
    for relative in licence_header.missing(checker.root):
        checker.defect(relative, "has no licence header (tools/device_check/licence_header.py "
                                 "--fix adds it)")


def check_test_mapping(checker, modules):
    tests = sorted(m["props"].get("name") for m in modules if m["type"] == "cc_test")
    for module in modules:
        if module["type"] == "cc_test" and not module["props"].get("test_suites"):
            checker.defect(module["file"], f"cc_test {module['props'].get('name')} names no "
                           "test_suites")
    if not checker.exists("TEST_MAPPING"):
        checker.defect("TEST_MAPPING", "is missing: the device tests run from it")
        return
    try:
        # TEST_MAPPING allows // comments on lines of their own.
        text = "\n".join(line for line in checker.read("TEST_MAPPING").splitlines()
                         if not line.lstrip().startswith("//"))
        mapping = json.loads(text)
    except ValueError as error:
        checker.defect("TEST_MAPPING", f"is not valid JSON: {error}")
        return
    mapped = set()
    for group, entries in mapping.items():
        if not isinstance(entries, list):
            continue
        for entry in entries:
            name = entry.get("name") if isinstance(entry, dict) else None
            if not isinstance(name, str):
                checker.defect("TEST_MAPPING", f"an entry of {group} has no name")
                continue
            mapped.add(name)
    names = {m["props"].get("name") for m in modules}
    for name in tests:
        if name not in mapped:
            checker.defect("TEST_MAPPING", f"cc_test {name} is not mapped")
    for name in sorted(mapped - names):
        checker.defect("TEST_MAPPING", f"names {name}, which no Android.bp defines")


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("root")
    parser.add_argument("--cmake-sources")
    args = parser.parse_args()
    checker = Checker(os.path.abspath(args.root))
    modules = load_modules(checker)
    binary_paths = check_init_scripts(checker, modules)
    check_policy_types(checker)
    check_policy_paths(checker, binary_paths)
    check_binder_path(checker)
    check_binary_labels(checker, modules)
    check_no_calls_into_shell(checker)
    check_ring_policy(checker)
    check_backlight_label(checker)
    check_sources(checker, modules, args.cmake_sources)
    check_host_only(checker, modules)
    check_conventions(checker, modules)
    check_licences(checker, modules)
    check_licence_headers(checker)
    check_test_mapping(checker, modules)
    for line in checker.warnings + checker.defects:
        print(line)
    if checker.defects:
        return 1
    print(f"device files: {len(modules)} modules, policy and init script consistent with the code")
    return 0


if __name__ == "__main__":
    sys.exit(main())
