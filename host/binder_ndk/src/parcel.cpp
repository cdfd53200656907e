// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include "parcel.h"

#include <android/binder_parcel_utils.h>
#include <fcntl.h>

#include <cstring>
#include <limits>
#include <string>
#include <utility>

#include "binder.h"
#include "status.h"

using vyr_binder::kMaxParcelBytes;
using vyr_binder::ParcelObject;

namespace {

constexpr size_t Padded(size_t size) {
    return (size + 3) & ~size_t{3};
}

enum : int32_t { kNullBinder = 0, kBinder = 1 };
// A descriptor's entry in the data: the marker, then for a descriptor its index in the table.
enum : int32_t { kNullDescriptor = 0, kDescriptor = 1 };

// Structurally valid UTF-8, without overlong forms or surrogates.
bool IsValidUtf8(const uint8_t* s, size_t n) {
    size_t i = 0;
    while (i < n) {
        uint8_t c = s[i];
        size_t extra;
        uint32_t cp;
        if (c < 0x80) {
            ++i;
            continue;
        } else if ((c & 0xe0) == 0xc0) {
            extra = 1;
            cp = c & 0x1f;
        } else if ((c & 0xf0) == 0xe0) {
            extra = 2;
            cp = c & 0x0f;
        } else if ((c & 0xf8) == 0xf0) {
            extra = 3;
            cp = c & 0x07;
        } else {
            return false;
        }
        if (n - i <= extra) return false;
        for (size_t k = 1; k <= extra; ++k) {
            if ((s[i + k] & 0xc0) != 0x80) return false;
            cp = (cp << 6) | (s[i + k] & 0x3f);
        }
        static constexpr uint32_t kMin[] = {0, 0x80, 0x800, 0x10000};
        if (cp < kMin[extra] || cp > 0x10ffff || (cp >= 0xd800 && cp <= 0xdfff)) return false;
        i += extra + 1;
    }
    return true;
}

template <typename T>
binder_status_t WriteValue(AParcel* parcel, T value) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    return parcel->Write(&value, sizeof(value));
}

template <typename T>
binder_status_t ReadValue(const AParcel* parcel, T* value) {
    if (parcel == nullptr || value == nullptr) return STATUS_UNEXPECTED_NULL;
    return parcel->Read(value, sizeof(T));
}

// Array header: -1 for null, else the element count. A null pointer is allowed only for -1 or 0.
binder_status_t WriteArrayLength(AParcel* parcel, bool null_data, int32_t length) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    if (length < -1) return STATUS_BAD_VALUE;
    if (!null_data && length < 0) return STATUS_BAD_VALUE;
    if (null_data && length > 0) return STATUS_BAD_VALUE;
    return parcel->Write(&length, sizeof(length));
}

// Reads an array length and checks that `length` elements of `wire_size` bytes are left.
binder_status_t ReadArrayLength(const AParcel* parcel, size_t wire_size, int32_t* length) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    binder_status_t status = parcel->Read(length, sizeof(*length));
    if (status != STATUS_OK) return status;
    if (*length < -1) return STATUS_BAD_VALUE;
    if (*length > 0 && static_cast<size_t>(*length) > parcel->Remaining() / wire_size) {
        return STATUS_NOT_ENOUGH_DATA;
    }
    return STATUS_OK;
}

// Arrays of fixed-size values are stored packed, padded at the end.
template <typename T>
binder_status_t WriteArray(AParcel* parcel, const T* array, int32_t length) {
    binder_status_t status = WriteArrayLength(parcel, array == nullptr, length);
    if (status != STATUS_OK || length <= 0) return status;
    return parcel->Write(array, sizeof(T) * static_cast<size_t>(length));
}

template <typename T>
binder_status_t ReadArray(const AParcel* parcel, void* array_data,
                          bool (*allocator)(void*, int32_t, T**)) {
    if (allocator == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t length;
    binder_status_t status = ReadArrayLength(parcel, sizeof(T), &length);
    if (status != STATUS_OK) return status;
    T* array = nullptr;
    if (!allocator(array_data, length, &array)) {
        return length < 0 ? STATUS_UNEXPECTED_NULL : STATUS_NO_MEMORY;
    }
    if (length <= 0) return STATUS_OK;
    if (array == nullptr) return STATUS_NO_MEMORY;
    return parcel->Read(array, sizeof(T) * static_cast<size_t>(length));
}

}  // namespace

binder_status_t AParcel::Write(const void* bytes, size_t size) {
    size_t padded = Padded(size);
    if (padded < size || pos > kMaxParcelBytes || padded > kMaxParcelBytes - pos) {
        return STATUS_NO_MEMORY;
    }
    size_t end = pos + padded;
    if (end > data.size()) data.resize(end);
    if (size > 0) std::memcpy(data.data() + pos, bytes, size);
    std::memset(data.data() + pos + size, 0, padded - size);
    pos = end;
    return STATUS_OK;
}

binder_status_t AParcel::Read(void* bytes, size_t size) const {
    size_t padded = Padded(size);
    if (padded < size || padded > Remaining()) return STATUS_NOT_ENOUGH_DATA;
    if (size > 0) std::memcpy(bytes, data.data() + pos, size);
    pos += padded;
    return STATUS_OK;
}

void AParcel::Clear() {
    data.clear();
    objects.clear();
    fds.clear();
    pos = 0;
}

void AParcel_delete(AParcel* parcel) {
    delete parcel;
}

AParcel* AParcel_create(void) {
    return new AParcel;
}

binder_status_t AParcel_reset(AParcel* parcel) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    parcel->Clear();
    return STATUS_OK;
}

int32_t AParcel_getDataSize(const AParcel* parcel) {
    return parcel == nullptr ? 0 : static_cast<int32_t>(parcel->data.size());
}

binder_status_t AParcel_setDataPosition(const AParcel* parcel, int32_t position) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    if (position < 0) return STATUS_BAD_VALUE;
    parcel->pos = static_cast<size_t>(position);
    return STATUS_OK;
}

int32_t AParcel_getDataPosition(const AParcel* parcel) {
    return parcel == nullptr ? 0 : static_cast<int32_t>(parcel->pos);
}

binder_status_t AParcel_writeStrongBinder(AParcel* parcel, AIBinder* binder) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    if (binder == nullptr) {
        int32_t header[2] = {kNullBinder, 0};
        return parcel->Write(header, sizeof(header));
    }
    if (parcel->objects.size() >= std::numeric_limits<int32_t>::max()) return STATUS_NO_MEMORY;
    uint32_t offset = static_cast<uint32_t>(parcel->pos);
    int32_t header[2] = {kBinder, static_cast<int32_t>(parcel->objects.size())};
    binder_status_t status = parcel->Write(header, sizeof(header));
    if (status != STATUS_OK) return status;
    AIBinder_incStrong(binder);
    parcel->objects.push_back(ParcelObject{offset, ndk::SpAIBinder(binder)});
    return STATUS_OK;
}

binder_status_t AParcel_readStrongBinder(const AParcel* parcel, AIBinder** binder) {
    if (parcel == nullptr || binder == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t header[2];
    binder_status_t status = parcel->Read(header, sizeof(header));
    if (status != STATUS_OK) return status;
    if (header[0] == kNullBinder) {
        *binder = nullptr;
        return STATUS_OK;
    }
    if (header[0] != kBinder || header[1] < 0 ||
        static_cast<size_t>(header[1]) >= parcel->objects.size()) {
        return STATUS_BAD_VALUE;
    }
    AIBinder* found = parcel->objects[static_cast<size_t>(header[1])].binder.get();
    if (found != nullptr) AIBinder_incStrong(found);
    *binder = found;
    return STATUS_OK;
}

binder_status_t AParcel_writeParcelFileDescriptor(AParcel* parcel, int fd) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    if (fd == -1) return WriteValue<int32_t>(parcel, kNullDescriptor);
    // As the platform's NDK answers other negative values (parcel.cpp), and a descriptor that
    // cannot be duplicated (libbinder's -errno, which the NDK prunes to this).
    if (fd < 0) return STATUS_UNKNOWN_ERROR;
    // The caller keeps its own descriptor: the parcel owns a duplicate, as libbinder's
    // writeDupParcelFileDescriptor makes one.
    ndk::ScopedFileDescriptor copy(fcntl(fd, F_DUPFD_CLOEXEC, 0));
    if (copy.get() < 0) return STATUS_UNKNOWN_ERROR;
    const int32_t entry[2] = {kDescriptor, static_cast<int32_t>(parcel->fds.size())};
    binder_status_t status = parcel->Write(entry, sizeof(entry));
    if (status != STATUS_OK) return status;
    parcel->fds.push_back(std::move(copy));
    return STATUS_OK;
}

binder_status_t AParcel_readParcelFileDescriptor(const AParcel* parcel, int* fd) {
    if (parcel == nullptr || fd == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t marker;
    binder_status_t status = parcel->Read(&marker, sizeof(marker));
    if (status != STATUS_OK) return status;
    if (marker == kNullDescriptor) {
        *fd = -1;
        return STATUS_OK;
    }
    if (marker != kDescriptor) return STATUS_BAD_VALUE;
    int32_t index;
    status = parcel->Read(&index, sizeof(index));
    if (status != STATUS_OK) return status;
    if (index < 0 || static_cast<size_t>(index) >= parcel->fds.size()) return STATUS_BAD_VALUE;
    // Every read hands the caller a descriptor of its own to close, as libbinder's
    // readUniqueParcelFileDescriptor does; the parcel keeps its copy.
    const int copy = fcntl(parcel->fds[static_cast<size_t>(index)].get(), F_DUPFD_CLOEXEC, 0);
    if (copy < 0) return STATUS_BAD_VALUE;
    *fd = copy;
    return STATUS_OK;
}

binder_status_t AParcel_writeStatusHeader(AParcel* parcel, const AStatus* status) {
    if (parcel == nullptr || status == nullptr) return STATUS_UNEXPECTED_NULL;
    // A transport failure is not sent as an exception: the transaction itself fails with it.
    if (status->exception == EX_TRANSACTION_FAILED) return status->error_code;
    binder_status_t ret = WriteValue<int32_t>(parcel, status->exception);
    if (ret != STATUS_OK || status->exception == EX_NONE) return ret;
    ret = AParcel_writeString(parcel, status->message.data(),
                              static_cast<int32_t>(status->message.size()));
    if (ret != STATUS_OK) return ret;
    return WriteValue<int32_t>(parcel, status->error_code);
}

binder_status_t AParcel_readStatusHeader(const AParcel* parcel, AStatus** status) {
    if (parcel == nullptr || status == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t exception;
    binder_status_t ret = ReadValue(parcel, &exception);
    if (ret != STATUS_OK) return ret;
    if (exception == EX_NONE) {
        *status = AStatus_newOk();
        return STATUS_OK;
    }
    if (exception == EX_TRANSACTION_FAILED) return STATUS_BAD_VALUE;
    std::string message;
    ret = ndk::AParcel_readString(parcel, &message);
    if (ret != STATUS_OK) return ret;
    int32_t code;
    ret = ReadValue(parcel, &code);
    if (ret != STATUS_OK) return ret;
    if (exception == EX_SERVICE_SPECIFIC) {
        *status = AStatus_fromServiceSpecificErrorWithMessage(code, message.c_str());
    } else {
        *status = AStatus_fromExceptionCodeWithMessage(exception, message.c_str());
    }
    return STATUS_OK;
}

binder_status_t AParcel_writeString(AParcel* parcel, const char* string, int32_t length) {
    if (parcel == nullptr) return STATUS_UNEXPECTED_NULL;
    if (string == nullptr) {
        if (length != -1) return STATUS_UNEXPECTED_NULL;
        return WriteValue<int32_t>(parcel, -1);
    }
    if (length < 0) return STATUS_BAD_VALUE;
    const uint8_t* bytes = reinterpret_cast<const uint8_t*>(string);
    if (!IsValidUtf8(bytes, static_cast<size_t>(length))) return STATUS_BAD_VALUE;
    if (static_cast<size_t>(length) >= kMaxParcelBytes) return STATUS_NO_MEMORY;
    // The length, the bytes and a terminator, written as one padded block.
    std::string block(sizeof(int32_t) + static_cast<size_t>(length) + 1, '\0');
    std::memcpy(&block[0], &length, sizeof(length));
    std::memcpy(&block[sizeof(length)], string, static_cast<size_t>(length));
    return parcel->Write(block.data(), block.size());
}

binder_status_t AParcel_readString(const AParcel* parcel, void* stringData,
                                   AParcel_stringAllocator allocator) {
    if (parcel == nullptr || allocator == nullptr) return STATUS_UNEXPECTED_NULL;
    size_t start = parcel->pos;
    int32_t length;
    binder_status_t status = parcel->Read(&length, sizeof(length));
    if (status != STATUS_OK) return status;
    if (length < -1) {
        parcel->pos = start;
        return STATUS_BAD_VALUE;
    }
    char* buffer = nullptr;
    if (length == -1) {
        if (!allocator(stringData, -1, &buffer)) return STATUS_UNEXPECTED_NULL;
        return STATUS_OK;
    }
    size_t size = static_cast<size_t>(length);
    if (size + 1 > parcel->Remaining()) {
        parcel->pos = start;
        return STATUS_NOT_ENOUGH_DATA;
    }
    const uint8_t* bytes = parcel->data.data() + parcel->pos;
    if (bytes[size] != 0 || !IsValidUtf8(bytes, size)) {
        parcel->pos = start;
        return STATUS_BAD_VALUE;
    }
    if (!allocator(stringData, length + 1, &buffer) || buffer == nullptr) return STATUS_NO_MEMORY;
    std::memcpy(buffer, bytes, size);
    buffer[size] = '\0';
    parcel->pos += Padded(size + 1);
    return STATUS_OK;
}

binder_status_t AParcel_writeStringArray(AParcel* parcel, const void* arrayData, int32_t length,
                                         AParcel_stringArrayElementGetter getter) {
    binder_status_t status = WriteArrayLength(parcel, arrayData == nullptr, length);
    if (status != STATUS_OK || length <= 0) return status;
    if (getter == nullptr) return STATUS_UNEXPECTED_NULL;
    for (int32_t i = 0; i < length; ++i) {
        int32_t element_length = 0;
        const char* element = getter(arrayData, static_cast<size_t>(i), &element_length);
        status = AParcel_writeString(parcel, element, element_length);
        if (status != STATUS_OK) return status;
    }
    return STATUS_OK;
}

binder_status_t AParcel_readStringArray(const AParcel* parcel, void* arrayData,
                                        AParcel_stringArrayAllocator allocator,
                                        AParcel_stringArrayElementAllocator elementAllocator) {
    if (allocator == nullptr || elementAllocator == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t length;
    binder_status_t status = ReadArrayLength(parcel, sizeof(int32_t), &length);
    if (status != STATUS_OK) return status;
    if (!allocator(arrayData, length)) {
        return length < 0 ? STATUS_UNEXPECTED_NULL : STATUS_NO_MEMORY;
    }
    for (int32_t i = 0; i < length; ++i) {
        struct Element {
            void* array;
            size_t index;
            AParcel_stringArrayElementAllocator allocate;
        } element{arrayData, static_cast<size_t>(i), elementAllocator};
        status = AParcel_readString(parcel, &element, [](void* data, int32_t len, char** buf) {
            Element* e = static_cast<Element*>(data);
            return e->allocate(e->array, e->index, len, buf);
        });
        if (status != STATUS_OK) return status;
    }
    return STATUS_OK;
}

binder_status_t AParcel_writeParcelableArray(AParcel* parcel, const void* arrayData, int32_t length,
                                             AParcel_writeParcelableElement elementWriter) {
    binder_status_t status = WriteArrayLength(parcel, arrayData == nullptr, length);
    if (status != STATUS_OK || length <= 0) return status;
    if (elementWriter == nullptr) return STATUS_UNEXPECTED_NULL;
    for (int32_t i = 0; i < length; ++i) {
        status = elementWriter(parcel, arrayData, static_cast<size_t>(i));
        if (status != STATUS_OK) return status;
    }
    return STATUS_OK;
}

binder_status_t AParcel_readParcelableArray(const AParcel* parcel, void* arrayData,
                                            AParcel_parcelableArrayAllocator allocator,
                                            AParcel_readParcelableElement elementReader) {
    if (allocator == nullptr || elementReader == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t length;
    // Every parcelable takes at least its four-byte presence marker.
    binder_status_t status = ReadArrayLength(parcel, sizeof(int32_t), &length);
    if (status != STATUS_OK) return status;
    if (!allocator(arrayData, length)) {
        return length < 0 ? STATUS_UNEXPECTED_NULL : STATUS_NO_MEMORY;
    }
    for (int32_t i = 0; i < length; ++i) {
        status = elementReader(parcel, arrayData, static_cast<size_t>(i));
        if (status != STATUS_OK) return status;
    }
    return STATUS_OK;
}

binder_status_t AParcel_writeInt32(AParcel* parcel, int32_t value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeUint32(AParcel* parcel, uint32_t value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeInt64(AParcel* parcel, int64_t value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeUint64(AParcel* parcel, uint64_t value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeFloat(AParcel* parcel, float value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeDouble(AParcel* parcel, double value) {
    return WriteValue(parcel, value);
}
binder_status_t AParcel_writeBool(AParcel* parcel, bool value) {
    return WriteValue<int32_t>(parcel, value ? 1 : 0);
}
binder_status_t AParcel_writeChar(AParcel* parcel, char16_t value) {
    return WriteValue<int32_t>(parcel, value);
}
binder_status_t AParcel_writeByte(AParcel* parcel, int8_t value) {
    return WriteValue<int32_t>(parcel, value);
}

binder_status_t AParcel_readInt32(const AParcel* parcel, int32_t* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readUint32(const AParcel* parcel, uint32_t* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readInt64(const AParcel* parcel, int64_t* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readUint64(const AParcel* parcel, uint64_t* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readFloat(const AParcel* parcel, float* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readDouble(const AParcel* parcel, double* value) {
    return ReadValue(parcel, value);
}
binder_status_t AParcel_readBool(const AParcel* parcel, bool* value) {
    int32_t raw;
    binder_status_t status = ReadValue(parcel, &raw);
    if (status == STATUS_OK) *value = raw != 0;
    return status;
}
binder_status_t AParcel_readChar(const AParcel* parcel, char16_t* value) {
    int32_t raw;
    binder_status_t status = ReadValue(parcel, &raw);
    if (status == STATUS_OK) *value = static_cast<char16_t>(raw);
    return status;
}
binder_status_t AParcel_readByte(const AParcel* parcel, int8_t* value) {
    int32_t raw;
    binder_status_t status = ReadValue(parcel, &raw);
    if (status == STATUS_OK) *value = static_cast<int8_t>(raw);
    return status;
}

binder_status_t AParcel_writeInt32Array(AParcel* parcel, const int32_t* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeUint32Array(AParcel* parcel, const uint32_t* arrayData,
                                         int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeInt64Array(AParcel* parcel, const int64_t* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeUint64Array(AParcel* parcel, const uint64_t* arrayData,
                                         int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeFloatArray(AParcel* parcel, const float* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeDoubleArray(AParcel* parcel, const double* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeCharArray(AParcel* parcel, const char16_t* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}
binder_status_t AParcel_writeByteArray(AParcel* parcel, const int8_t* arrayData, int32_t length) {
    return WriteArray(parcel, arrayData, length);
}

binder_status_t AParcel_writeBoolArray(AParcel* parcel, const void* arrayData, int32_t length,
                                       AParcel_boolArrayGetter getter) {
    binder_status_t status = WriteArrayLength(parcel, arrayData == nullptr, length);
    if (status != STATUS_OK || length <= 0) return status;
    if (getter == nullptr) return STATUS_UNEXPECTED_NULL;
    for (int32_t i = 0; i < length; ++i) {
        status = AParcel_writeBool(parcel, getter(arrayData, static_cast<size_t>(i)));
        if (status != STATUS_OK) return status;
    }
    return STATUS_OK;
}

binder_status_t AParcel_readInt32Array(const AParcel* parcel, void* arrayData,
                                       AParcel_int32ArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readUint32Array(const AParcel* parcel, void* arrayData,
                                        AParcel_uint32ArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readInt64Array(const AParcel* parcel, void* arrayData,
                                       AParcel_int64ArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readUint64Array(const AParcel* parcel, void* arrayData,
                                        AParcel_uint64ArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readFloatArray(const AParcel* parcel, void* arrayData,
                                       AParcel_floatArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readDoubleArray(const AParcel* parcel, void* arrayData,
                                        AParcel_doubleArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readCharArray(const AParcel* parcel, void* arrayData,
                                      AParcel_charArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}
binder_status_t AParcel_readByteArray(const AParcel* parcel, void* arrayData,
                                      AParcel_byteArrayAllocator allocator) {
    return ReadArray(parcel, arrayData, allocator);
}

binder_status_t AParcel_readBoolArray(const AParcel* parcel, void* arrayData,
                                      AParcel_boolArrayAllocator allocator,
                                      AParcel_boolArraySetter setter) {
    if (allocator == nullptr || setter == nullptr) return STATUS_UNEXPECTED_NULL;
    int32_t length;
    binder_status_t status = ReadArrayLength(parcel, sizeof(int32_t), &length);
    if (status != STATUS_OK) return status;
    if (!allocator(arrayData, length)) {
        return length < 0 ? STATUS_UNEXPECTED_NULL : STATUS_NO_MEMORY;
    }
    for (int32_t i = 0; i < length; ++i) {
        bool value;
        status = AParcel_readBool(parcel, &value);
        if (status != STATUS_OK) return status;
        setter(arrayData, static_cast<size_t>(i), value);
    }
    return STATUS_OK;
}
