// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <apex_update_listener.h>

#include <cstdint>
#include <ostream>
#include <set>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

namespace vyr_test::apex {

inline constexpr char kPackage[] = "com.tarven.nomil.camera.hal";
inline constexpr char kOtherPackage[] = "com.android.media.swcodec";
inline constexpr char kLogTag[] = "apex_update_listener";

using Attributes = std::vector<std::pair<std::string, std::string>>;

// `<apex-info name="value" .../>`, values written as given.
std::string Entry(const Attributes& attributes);
// A whole list document around the given entries.
std::string InfoList(const std::vector<std::string>& entries);

// A typical active entry of `package` at `version`, and the record read from it.
Attributes ActiveEntry(const std::string& package, int64_t version);
ApexUpdateListener::Info ActiveInfo(const std::string& package, int64_t version);

// Every field in declaration order, so records compare field by field and print readably.
using InfoFields =
    std::tuple<std::string, std::string, std::string, int64_t, std::string, bool, bool>;
InfoFields Fields(const ApexUpdateListener::Info& info);
std::vector<InfoFields> Fields(const std::set<ApexUpdateListener::Info>& infos);

}  // namespace vyr_test::apex

void PrintTo(const ApexUpdateListener::Info& info, std::ostream* os);
