// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "apex_info_xml.h"

namespace vyr_test::apex {

std::string Entry(const Attributes& attributes) {
    std::string entry = "    <apex-info";
    for (const auto& [name, value] : attributes) entry += " " + name + "=\"" + value + "\"";
    return entry + "/>\n";
}

std::string InfoList(const std::vector<std::string>& entries) {
    std::string list = "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n<apex-info-list>\n";
    for (const auto& entry : entries) list += entry;
    return list + "</apex-info-list>\n";
}

Attributes ActiveEntry(const std::string& package, int64_t version) {
    return {{"moduleName", package},
            {"modulePath", "/data/apex/active/" + package + "@" + std::to_string(version) + ".apex"},
            {"preinstalledModulePath", "/vendor/apex/" + package + ".apex"},
            {"versionCode", std::to_string(version)},
            {"versionName", "v" + std::to_string(version)},
            {"isFactory", "false"},
            {"isActive", "true"}};
}

ApexUpdateListener::Info ActiveInfo(const std::string& package, int64_t version) {
    ApexUpdateListener::Info info;
    info.module_name = package;
    info.module_path = "/data/apex/active/" + package + "@" + std::to_string(version) + ".apex";
    info.preinstalled_module_path = "/vendor/apex/" + package + ".apex";
    info.version_code = version;
    info.version_name = "v" + std::to_string(version);
    info.is_factory = false;
    info.is_active = true;
    return info;
}

InfoFields Fields(const ApexUpdateListener::Info& info) {
    return {info.module_name,  info.module_path,  info.preinstalled_module_path,
            info.version_code, info.version_name, info.is_factory,
            info.is_active};
}

std::vector<InfoFields> Fields(const std::set<ApexUpdateListener::Info>& infos) {
    std::vector<InfoFields> fields;
    for (const auto& info : infos) fields.push_back(Fields(info));
    return fields;
}

}  // namespace vyr_test::apex

void PrintTo(const ApexUpdateListener::Info& info, std::ostream* os) {
    *os << "{module_name=\"" << info.module_name << "\" module_path=\"" << info.module_path
        << "\" preinstalled_module_path=\"" << info.preinstalled_module_path
        << "\" version_code=" << info.version_code << " version_name=\"" << info.version_name
        << "\" is_factory=" << info.is_factory << " is_active=" << info.is_active << "}";
}
