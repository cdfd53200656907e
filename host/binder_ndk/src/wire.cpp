// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "wire.h"

#include <cstring>

namespace vyr_binder {
namespace {

struct ObjectEntry {
    uint32_t kind;
    uint32_t descriptor_size;
    uint64_t id;
};
static_assert(sizeof(ObjectEntry) == 16, "entries are sent as they are laid out");

constexpr size_t Padded(size_t size) {
    return (size + 3) & ~size_t{3};
}

}  // namespace

bool ValidateHeader(const FrameHeader& header) {
    if (header.magic != kFrameMagic || header.descriptor_count > kMaxDescriptorsPerFrame) {
        return false;
    }
    if (header.data_size > kMaxTransactionBytes || header.object_count > kMaxObjects) return false;
    size_t max_table =
        static_cast<size_t>(header.object_count) * (sizeof(ObjectEntry) + kMaxDescriptorBytes);
    if (header.table_size > max_table || header.table_size > kMaxTransactionBytes ||
        header.table_size < header.object_count * sizeof(ObjectEntry)) {
        return false;
    }
    switch (static_cast<FrameType>(header.type)) {
        case FrameType::kHello:
        case FrameType::kRelease:
            return header.object_count == 0 && header.descriptor_count == 0;
        case FrameType::kTransaction:
        case FrameType::kReply:
            return true;
    }
    return false;
}

void EncodeObjects(const std::vector<WireObject>& objects, std::vector<uint8_t>* table) {
    table->clear();
    for (const WireObject& object : objects) {
        ObjectEntry entry{static_cast<uint32_t>(object.kind),
                          static_cast<uint32_t>(object.descriptor.size()), object.id};
        size_t at = table->size();
        table->resize(at + sizeof(entry) + Padded(object.descriptor.size()), 0);
        std::memcpy(table->data() + at, &entry, sizeof(entry));
        if (!object.descriptor.empty()) {
            std::memcpy(table->data() + at + sizeof(entry), object.descriptor.data(),
                        object.descriptor.size());
        }
    }
}

bool DecodeObjects(const uint8_t* table, size_t size, uint32_t count,
                   std::vector<WireObject>* objects) {
    objects->clear();
    size_t at = 0;
    for (uint32_t i = 0; i < count; ++i) {
        ObjectEntry entry;
        if (size - at < sizeof(entry)) return false;
        std::memcpy(&entry, table + at, sizeof(entry));
        at += sizeof(entry);
        ObjectKind kind = static_cast<ObjectKind>(entry.kind);
        if (kind != ObjectKind::kSenderObject && kind != ObjectKind::kReceiverObject) return false;
        if (entry.id == 0 || entry.descriptor_size > kMaxDescriptorBytes) return false;
        if (kind == ObjectKind::kReceiverObject && entry.descriptor_size != 0) return false;
        size_t padded = Padded(entry.descriptor_size);
        if (size - at < padded) return false;
        objects->push_back(WireObject{
            kind, entry.id,
            std::string(reinterpret_cast<const char*>(table + at), entry.descriptor_size)});
        at += padded;
    }
    return at == size;
}

}  // namespace vyr_binder
