#include "dump_value.h"

#include <cstdio>

namespace android {
namespace vyr {
namespace binder {
namespace {

void AppendJsonString(const std::string& text, std::string* out) {
    out->push_back('"');
    for (unsigned char c : text) {
        switch (c) {
            case '"':
                *out += "\\\"";
                break;
            case '\\':
                *out += "\\\\";
                break;
            case '\n':
                *out += "\\n";
                break;
            default:
                if (c < 0x20) {
                    char escaped[8];
                    snprintf(escaped, sizeof(escaped), "\\u%04x", c);
                    *out += escaped;
                } else {
                    out->push_back(static_cast<char>(c));
                }
        }
    }
    out->push_back('"');
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
            return string_;
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
