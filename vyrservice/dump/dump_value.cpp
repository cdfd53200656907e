// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "dump_value.h"

#include <cstdio>

namespace android {
namespace vyr {
namespace binder {
namespace {

// The length of the well-formed UTF-8 sequence at `at` (no overlong form, no surrogate, nothing
// above U+10FFFF), or 0 if the bytes there are not one.
size_t Utf8SequenceLength(const std::string& text, size_t at) {
    const auto byte = [&text](size_t i) { return static_cast<unsigned char>(text[i]); };
    const unsigned char lead = byte(at);
    if (lead < 0x80) return 1;
    size_t length;
    unsigned char low = 0x80;
    unsigned char high = 0xBF;
    if (lead >= 0xC2 && lead <= 0xDF) {
        length = 2;
    } else if (lead >= 0xE0 && lead <= 0xEF) {
        length = 3;
        if (lead == 0xE0) low = 0xA0;
        if (lead == 0xED) high = 0x9F;
    } else if (lead >= 0xF0 && lead <= 0xF4) {
        length = 4;
        if (lead == 0xF0) low = 0x90;
        if (lead == 0xF4) high = 0x8F;
    } else {
        return 0;
    }
    if (at + length > text.size()) return 0;
    if (byte(at + 1) < low || byte(at + 1) > high) return 0;
    for (size_t i = 2; i < length; ++i) {
        if (byte(at + i) < 0x80 || byte(at + i) > 0xBF) return 0;
    }
    return length;
}

// JSON must be UTF-8: a byte that starts no well-formed sequence becomes U+FFFD.
void AppendJsonString(const std::string& text, std::string* out) {
    out->push_back('"');
    for (size_t at = 0; at < text.size();) {
        const unsigned char c = static_cast<unsigned char>(text[at]);
        const size_t length = Utf8SequenceLength(text, at);
        if (length == 0) {
            *out += "\\ufffd";
            ++at;
            continue;
        }
        if (length > 1) {
            out->append(text, at, length);
        } else if (c == '"') {
            *out += "\\\"";
        } else if (c == '\\') {
            *out += "\\\\";
        } else if (c == '\n') {
            *out += "\\n";
        } else if (c < 0x20) {
            char escaped[8];
            snprintf(escaped, sizeof(escaped), "\\u%04x", c);
            *out += escaped;
        } else {
            out->push_back(static_cast<char>(c));
        }
        at += length;
    }
    out->push_back('"');
}

// Text for a terminal: control characters and bytes that are not UTF-8 are shown as \xNN, so
// that they can neither break the layout nor garble the screen.
std::string ReadableText(const std::string& text) {
    std::string out;
    for (size_t at = 0; at < text.size();) {
        const unsigned char c = static_cast<unsigned char>(text[at]);
        const size_t length = Utf8SequenceLength(text, at);
        if (length == 0 || c < 0x20 || c == 0x7F) {
            char escaped[8];
            snprintf(escaped, sizeof(escaped), "\\x%02x", c);
            out += escaped;
            ++at;
            continue;
        }
        out.append(text, at, length);
        at += length;
    }
    return out;
}

}  // namespace

DumpValue::DumpValue(bool value) : kind_(Kind::kBool), bool_(value) {}
DumpValue::DumpValue(int64_t value) : kind_(Kind::kInt), int_(value) {}
DumpValue::DumpValue(std::string value) : kind_(Kind::kString), string_(std::move(value)) {}

DumpValue DumpValue::Object() {
    DumpValue value;
    value.kind_ = Kind::kObject;
    return value;
}

DumpValue DumpValue::Array() {
    DumpValue value;
    value.kind_ = Kind::kArray;
    return value;
}

DumpValue& DumpValue::Set(const std::string& key, DumpValue value) {
    members_.emplace_back(key, std::move(value));
    return members_.back().second;
}

DumpValue& DumpValue::Append(DumpValue value) {
    elements_.push_back(std::move(value));
    return elements_.back();
}

std::string DumpValue::ScalarText() const {
    switch (kind_) {
        case Kind::kBool:
            return bool_ ? "yes" : "no";
        case Kind::kInt:
            return std::to_string(int_);
        case Kind::kString:
            return ReadableText(string_);
        default:
            return "-";
    }
}

std::string DumpValue::ToText() const {
    std::string out;
    AppendText(0, &out);
    return out;
}

void DumpValue::AppendText(int indent, std::string* out) const {
    const std::string pad(static_cast<size_t>(indent), ' ');
    if (kind_ == Kind::kObject) {
        for (const auto& [key, value] : members_) {
            if (value.IsScalar()) {
                *out += pad + key + ": " + value.ScalarText() + "\n";
            } else if (value.members_.empty() && value.elements_.empty()) {
                *out += pad + key + ": none\n";
            } else {
                *out += pad + key + ":\n";
                value.AppendText(indent + 2, out);
            }
        }
    } else if (kind_ == Kind::kArray) {
        for (const DumpValue& element : elements_) {
            if (element.IsScalar()) {
                *out += pad + "- " + element.ScalarText() + "\n";
                continue;
            }
            // The first line of an element carries its dash.
            std::string item;
            element.AppendText(indent + 2, &item);
            if (item.size() > pad.size() + 2) item.replace(pad.size(), 2, "- ");
            *out += item;
        }
    } else {
        *out += pad + ScalarText() + "\n";
    }
}

std::string DumpValue::ToJson() const {
    std::string out;
    AppendJson(&out);
    return out;
}

void DumpValue::AppendJson(std::string* out) const {
    switch (kind_) {
        case Kind::kNull:
            *out += "null";
            break;
        case Kind::kBool:
            *out += bool_ ? "true" : "false";
            break;
        case Kind::kInt:
            *out += std::to_string(int_);
            break;
        case Kind::kString:
            AppendJsonString(string_, out);
            break;
        case Kind::kArray:
            out->push_back('[');
            for (size_t i = 0; i < elements_.size(); ++i) {
                if (i > 0) out->push_back(',');
                elements_[i].AppendJson(out);
            }
            out->push_back(']');
            break;
        case Kind::kObject:
            out->push_back('{');
            for (size_t i = 0; i < members_.size(); ++i) {
                if (i > 0) out->push_back(',');
                AppendJsonString(members_[i].first, out);
                out->push_back(':');
                members_[i].second.AppendJson(out);
            }
            out->push_back('}');
            break;
    }
}

}  // namespace binder
}  // namespace vyr
}  // namespace android
