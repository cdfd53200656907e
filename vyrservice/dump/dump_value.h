// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace android {
namespace vyr {
namespace binder {

// What a dump shows, as a tree of named values, written out either as indented text for a person
// or as one JSON object for a script; both show the same values.
class DumpValue {
  public:
    // Null: shown as "-" in text.
    DumpValue() = default;
    DumpValue(bool value);  // NOLINT(google-explicit-constructor): values read as literals
    DumpValue(int64_t value);
    DumpValue(int32_t value) : DumpValue(static_cast<int64_t>(value)) {}
    DumpValue(uint64_t value) : DumpValue(static_cast<int64_t>(value)) {}
    DumpValue(uint32_t value) : DumpValue(static_cast<int64_t>(value)) {}
    DumpValue(std::string value);
    DumpValue(const char* value) : DumpValue(std::string(value)) {}

    static DumpValue Object();
    static DumpValue Array();

    // Adds a member to an object, in order; returns it for nesting.
    DumpValue& Set(const std::string& key, DumpValue value);
    // Appends an element to an array; returns it for nesting.
    DumpValue& Append(DumpValue value);

    std::string ToText() const;
    std::string ToJson() const;

  private:
    enum class Kind { kNull, kBool, kInt, kString, kArray, kObject };

    bool IsScalar() const { return kind_ != Kind::kArray && kind_ != Kind::kObject; }
    std::string ScalarText() const;
    void AppendText(int indent, std::string* out) const;
    void AppendJson(std::string* out) const;

    Kind kind_ = Kind::kNull;
    bool bool_ = false;
    int64_t int_ = 0;
    std::string string_;
    std::vector<std::pair<std::string, DumpValue>> members_;
    std::vector<DumpValue> elements_;
};

}  // namespace binder
}  // namespace vyr
}  // namespace android
