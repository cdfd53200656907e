// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace vyr_binder {

// One frame on a connection: a fixed header, the parcel data, then the binder object table.
enum class FrameType : uint32_t {
    kHello = 1,        // data: the sender's process key
    kTransaction = 2,  // target, code, flags, parent; data and objects
    kReply = 3,        // code holds the transaction's status
    kRelease = 4,      // target: an object of the receiver; code: references dropped
};

struct FrameHeader {
    uint32_t magic;
    uint32_t type;
    uint32_t flags;
    uint32_t code;
    uint32_t data_size;
    uint32_t object_count;
    uint32_t table_size;
    // File descriptors sent with the frame's first byte (SCM_RIGHTS): the parcel's, in the order
    // of its table.
    uint32_t descriptor_count;
    uint64_t transaction_id;
    uint64_t target;
    // For a transaction made while serving one from the same peer: that one's id, so the peer
    // runs it on the thread that waits for it.
    uint64_t parent;
};
static_assert(sizeof(FrameHeader) == 56, "the header is sent as it is laid out");

constexpr uint32_t kFrameMagic = 0x42525956;  // "VYRB"
// The platform's transaction buffer; larger parcels are refused.
constexpr size_t kMaxTransactionBytes = 1u << 20;
constexpr size_t kMaxDescriptorBytes = 1024;
constexpr size_t kMaxObjects = kMaxTransactionBytes / 8;
// Descriptors one frame may carry. A host limit: a device's driver takes as many as the
// receiver may open. A parcel with more is refused with STATUS_FAILED_TRANSACTION.
constexpr size_t kMaxDescriptorsPerFrame = 64;

enum class ObjectKind : uint32_t {
    kSenderObject = 1,    // implemented by the sender; carries its descriptor
    kReceiverObject = 2,  // implemented by the receiver
};

struct WireObject {
    ObjectKind kind;
    uint64_t id;
    std::string descriptor;
};

// Checks a received header; false for anything this runtime never sends.
bool ValidateHeader(const FrameHeader& header);

// The object table as sent: per object kind, descriptor length, id, descriptor padded to four.
void EncodeObjects(const std::vector<WireObject>& objects, std::vector<uint8_t>* table);
bool DecodeObjects(const uint8_t* table, size_t size, uint32_t count,
                   std::vector<WireObject>* objects);

}  // namespace vyr_binder
