// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <android/binder_auto_utils.h>
#include <android/binder_parcel.h>

#include <cstdint>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

namespace ndk {

// ---- Allocators that let the C array readers fill standard containers ----

template <typename T>
static inline bool AParcel_stdVectorAllocator(void* vectorData, int32_t length, T** outBuffer) {
    if (length < 0) return false;
    std::vector<T>* vec = static_cast<std::vector<T>*>(vectorData);
    vec->resize(static_cast<size_t>(length));
    *outBuffer = vec->data();
    return true;
}

template <typename T>
static inline bool AParcel_nullableStdVectorAllocator(void* vectorData, int32_t length,
                                                      T** outBuffer) {
    std::optional<std::vector<T>>* vec = static_cast<std::optional<std::vector<T>>*>(vectorData);
    if (length < 0) {
        *vec = std::nullopt;
        return true;
    }
    *vec = std::optional<std::vector<T>>(std::vector<T>{});
    (*vec)->resize(static_cast<size_t>(length));
    *outBuffer = (*vec)->data();
    return true;
}

template <typename T>
static inline bool AParcel_stdVectorExternalAllocator(void* vectorData, int32_t length) {
    if (length < 0) return false;
    std::vector<T>* vec = static_cast<std::vector<T>*>(vectorData);
    vec->resize(static_cast<size_t>(length));
    return true;
}

template <typename T>
static inline bool AParcel_nullableStdVectorExternalAllocator(void* vectorData, int32_t length) {
    std::optional<std::vector<T>>* vec = static_cast<std::optional<std::vector<T>>*>(vectorData);
    if (length < 0) {
        *vec = std::nullopt;
        return true;
    }
    *vec = std::optional<std::vector<T>>(std::vector<T>{});
    (*vec)->resize(static_cast<size_t>(length));
    return true;
}

static inline bool AParcel_stdVectorGetter_bool(const void* vectorData, size_t index) {
    return (*static_cast<const std::vector<bool>*>(vectorData))[index];
}
static inline void AParcel_stdVectorSetter_bool(void* vectorData, size_t index, bool value) {
    (*static_cast<std::vector<bool>*>(vectorData))[index] = value;
}
static inline bool AParcel_nullableStdVectorGetter_bool(const void* vectorData, size_t index) {
    return (**static_cast<const std::optional<std::vector<bool>>*>(vectorData))[index];
}
static inline void AParcel_nullableStdVectorSetter_bool(void* vectorData, size_t index, bool value) {
    (**static_cast<std::optional<std::vector<bool>>*>(vectorData))[index] = value;
}

static inline bool AParcel_stdStringAllocator(void* stringData, int32_t length, char** buffer) {
    if (length <= 0) return false;
    std::string* str = static_cast<std::string*>(stringData);
    str->resize(static_cast<size_t>(length) - 1);
    *buffer = &(*str)[0];
    return true;
}

static inline bool AParcel_nullableStdStringAllocator(void* stringData, int32_t length,
                                                      char** buffer) {
    std::optional<std::string>* str = static_cast<std::optional<std::string>*>(stringData);
    if (length < 0) {
        *str = std::nullopt;
        return true;
    }
    if (length == 0) return false;
    *str = std::optional<std::string>(std::string{});
    (*str)->resize(static_cast<size_t>(length) - 1);
    *buffer = &(**str)[0];
    return true;
}

static inline bool AParcel_stdVectorStringElementAllocator(void* vectorData, size_t index,
                                                           int32_t length, char** buffer) {
    std::vector<std::string>* vec = static_cast<std::vector<std::string>*>(vectorData);
    return AParcel_stdStringAllocator(&(*vec)[index], length, buffer);
}

static inline const char* AParcel_stdVectorStringElementGetter(const void* vectorData, size_t index,
                                                               int32_t* outLength) {
    const std::vector<std::string>* vec = static_cast<const std::vector<std::string>*>(vectorData);
    const std::string& element = (*vec)[index];
    *outLength = static_cast<int32_t>(element.size());
    return element.c_str();
}

// ---- Strings ----

static inline binder_status_t AParcel_writeString(AParcel* parcel, const std::string& str) {
    return ::AParcel_writeString(parcel, str.c_str(), static_cast<int32_t>(str.size()));
}

static inline binder_status_t AParcel_readString(const AParcel* parcel, std::string* str) {
    return ::AParcel_readString(parcel, static_cast<void*>(str), AParcel_stdStringAllocator);
}

static inline binder_status_t AParcel_writeString(AParcel* parcel,
                                                  const std::optional<std::string>& str) {
    if (!str) return ::AParcel_writeString(parcel, nullptr, -1);
    return ::AParcel_writeString(parcel, str->c_str(), static_cast<int32_t>(str->size()));
}

static inline binder_status_t AParcel_readString(const AParcel* parcel,
                                                 std::optional<std::string>* str) {
    return ::AParcel_readString(parcel, static_cast<void*>(str), AParcel_nullableStdStringAllocator);
}

static inline binder_status_t AParcel_writeVector(AParcel* parcel,
                                                  const std::vector<std::string>& vec) {
    return AParcel_writeStringArray(parcel, static_cast<const void*>(&vec),
                                    static_cast<int32_t>(vec.size()),
                                    AParcel_stdVectorStringElementGetter);
}

static inline binder_status_t AParcel_readVector(const AParcel* parcel,
                                                 std::vector<std::string>* vec) {
    return AParcel_readStringArray(parcel, static_cast<void*>(vec),
                                   AParcel_stdVectorExternalAllocator<std::string>,
                                   AParcel_stdVectorStringElementAllocator);
}

// ---- Binders ----

static inline binder_status_t AParcel_writeRequiredStrongBinder(AParcel* parcel,
                                                                const SpAIBinder& binder) {
    if (binder.get() == nullptr) return STATUS_UNEXPECTED_NULL;
    return AParcel_writeStrongBinder(parcel, binder.get());
}

static inline binder_status_t AParcel_readRequiredStrongBinder(const AParcel* parcel,
                                                               SpAIBinder* binder) {
    AIBinder* readBinder = nullptr;
    binder_status_t status = AParcel_readStrongBinder(parcel, &readBinder);
    if (status == STATUS_OK) {
        if (readBinder == nullptr) return STATUS_UNEXPECTED_NULL;
        binder->set(readBinder);
    }
    return status;
}

static inline binder_status_t AParcel_writeNullableStrongBinder(AParcel* parcel,
                                                                const SpAIBinder& binder) {
    return AParcel_writeStrongBinder(parcel, binder.get());
}

static inline binder_status_t AParcel_readNullableStrongBinder(const AParcel* parcel,
                                                               SpAIBinder* binder) {
    AIBinder* readBinder = nullptr;
    binder_status_t status = AParcel_readStrongBinder(parcel, &readBinder);
    if (status == STATUS_OK) binder->set(readBinder);
    return status;
}

// ---- Parcelables (types with readFromParcel/writeToParcel) ----

// A ParcelFileDescriptor as the generated code passes it: the parcel keeps a duplicate, and a
// read hands the caller a duplicate of its own. A required one may not be null.
static inline binder_status_t AParcel_writeRequiredParcelFileDescriptor(
    AParcel* parcel, const ScopedFileDescriptor& fd) {
    if (fd.get() < 0) return STATUS_UNEXPECTED_NULL;
    return AParcel_writeParcelFileDescriptor(parcel, fd.get());
}

static inline binder_status_t AParcel_readRequiredParcelFileDescriptor(const AParcel* parcel,
                                                                       ScopedFileDescriptor* fd) {
    int readFd;
    binder_status_t status = AParcel_readParcelFileDescriptor(parcel, &readFd);
    if (status != STATUS_OK) return status;
    if (readFd < 0) return STATUS_UNEXPECTED_NULL;
    fd->set(readFd);
    return STATUS_OK;
}

static inline binder_status_t AParcel_writeNullableParcelFileDescriptor(
    AParcel* parcel, const ScopedFileDescriptor& fd) {
    return AParcel_writeParcelFileDescriptor(parcel, fd.get());
}

static inline binder_status_t AParcel_readNullableParcelFileDescriptor(const AParcel* parcel,
                                                                       ScopedFileDescriptor* fd) {
    int readFd;
    binder_status_t status = AParcel_readParcelFileDescriptor(parcel, &readFd);
    if (status == STATUS_OK) fd->set(readFd);
    return status;
}

template <typename P>
static inline binder_status_t AParcel_writeParcelable(AParcel* parcel, const P& p) {
    return p.writeToParcel(parcel);
}

template <typename P>
static inline binder_status_t AParcel_readParcelable(const AParcel* parcel, P* p) {
    return p->readFromParcel(parcel);
}

template <typename P>
static inline binder_status_t AParcel_writeStdVectorParcelableElement(AParcel* parcel,
                                                                      const void* vectorData,
                                                                      size_t index) {
    const std::vector<P>* vector = static_cast<const std::vector<P>*>(vectorData);
    return (*vector)[index].writeToParcel(parcel);
}

template <typename P>
static inline binder_status_t AParcel_readStdVectorParcelableElement(const AParcel* parcel,
                                                                     void* vectorData,
                                                                     size_t index) {
    std::vector<P>* vector = static_cast<std::vector<P>*>(vectorData);
    return (*vector)[index].readFromParcel(parcel);
}

// ---- Vectors of primitives ----

namespace internal {
template <typename T>
struct ArrayOps;

#define VYR_NDK_ARRAY_OPS(T, Name)                                                \
    template <>                                                                   \
    struct ArrayOps<T> {                                                          \
        static binder_status_t write(AParcel* p, const T* data, int32_t length) { \
            return AParcel_write##Name##Array(p, data, length);                   \
        }                                                                         \
        static binder_status_t read(const AParcel* p, void* data,                 \
                                    bool (*alloc)(void*, int32_t, T**)) {         \
            return AParcel_read##Name##Array(p, data, alloc);                     \
        }                                                                         \
    };
VYR_NDK_ARRAY_OPS(int32_t, Int32)
VYR_NDK_ARRAY_OPS(uint32_t, Uint32)
VYR_NDK_ARRAY_OPS(int64_t, Int64)
VYR_NDK_ARRAY_OPS(uint64_t, Uint64)
VYR_NDK_ARRAY_OPS(float, Float)
VYR_NDK_ARRAY_OPS(double, Double)
VYR_NDK_ARRAY_OPS(char16_t, Char)
VYR_NDK_ARRAY_OPS(int8_t, Byte)
#undef VYR_NDK_ARRAY_OPS

template <typename T, typename = void>
struct HasArrayOps : std::false_type {};
template <typename T>
struct HasArrayOps<T, std::void_t<decltype(&ArrayOps<T>::write)>> : std::true_type {};

template <typename T, typename = void>
struct IsParcelable : std::false_type {};
template <typename T>
struct IsParcelable<T, std::void_t<decltype(std::declval<const T&>().writeToParcel(nullptr)),
                                   decltype(std::declval<T&>().readFromParcel(nullptr))>>
    : std::true_type {};

template <typename T>
using IfArray = std::enable_if_t<HasArrayOps<T>::value, binder_status_t>;
template <typename T>
using IfParcelable = std::enable_if_t<IsParcelable<T>::value, binder_status_t>;
}  // namespace internal

template <typename T>
static inline internal::IfArray<T> AParcel_writeVector(AParcel* parcel, const std::vector<T>& vec) {
    return internal::ArrayOps<T>::write(parcel, vec.data(), static_cast<int32_t>(vec.size()));
}

template <typename T>
static inline internal::IfArray<T> AParcel_readVector(const AParcel* parcel, std::vector<T>* vec) {
    return internal::ArrayOps<T>::read(parcel, static_cast<void*>(vec),
                                       AParcel_stdVectorAllocator<T>);
}

template <typename T>
static inline internal::IfArray<T> AParcel_writeVector(AParcel* parcel,
                                                       const std::optional<std::vector<T>>& vec) {
    if (!vec) return internal::ArrayOps<T>::write(parcel, nullptr, -1);
    return internal::ArrayOps<T>::write(parcel, vec->data(), static_cast<int32_t>(vec->size()));
}

template <typename T>
static inline internal::IfArray<T> AParcel_readVector(const AParcel* parcel,
                                                      std::optional<std::vector<T>>* vec) {
    return internal::ArrayOps<T>::read(parcel, static_cast<void*>(vec),
                                       AParcel_nullableStdVectorAllocator<T>);
}

static inline binder_status_t AParcel_writeVector(AParcel* parcel, const std::vector<uint8_t>& vec) {
    return AParcel_writeByteArray(parcel, reinterpret_cast<const int8_t*>(vec.data()),
                                  static_cast<int32_t>(vec.size()));
}

static inline binder_status_t AParcel_readVector(const AParcel* parcel, std::vector<uint8_t>* vec) {
    return AParcel_readByteArray(parcel, static_cast<void*>(vec),
                                 [](void* data, int32_t length, int8_t** outBuffer) -> bool {
                                     uint8_t* buffer = nullptr;
                                     if (!AParcel_stdVectorAllocator<uint8_t>(data, length, &buffer))
                                         return false;
                                     *outBuffer = reinterpret_cast<int8_t*>(buffer);
                                     return true;
                                 });
}

static inline binder_status_t AParcel_writeVector(AParcel* parcel, const std::vector<bool>& vec) {
    return AParcel_writeBoolArray(parcel, static_cast<const void*>(&vec),
                                  static_cast<int32_t>(vec.size()), AParcel_stdVectorGetter_bool);
}

static inline binder_status_t AParcel_readVector(const AParcel* parcel, std::vector<bool>* vec) {
    return AParcel_readBoolArray(parcel, static_cast<void*>(vec),
                                 AParcel_stdVectorExternalAllocator<bool>,
                                 AParcel_stdVectorSetter_bool);
}

static inline binder_status_t AParcel_writeVector(AParcel* parcel,
                                                  const std::optional<std::vector<bool>>& vec) {
    if (!vec) return AParcel_writeBoolArray(parcel, nullptr, -1, AParcel_stdVectorGetter_bool);
    return AParcel_writeBoolArray(parcel, static_cast<const void*>(&vec),
                                  static_cast<int32_t>(vec->size()),
                                  AParcel_nullableStdVectorGetter_bool);
}

static inline binder_status_t AParcel_readVector(const AParcel* parcel,
                                                 std::optional<std::vector<bool>>* vec) {
    return AParcel_readBoolArray(parcel, static_cast<void*>(vec),
                                 AParcel_nullableStdVectorExternalAllocator<bool>,
                                 AParcel_nullableStdVectorSetter_bool);
}

// Vectors of parcelables.
template <typename P>
static inline internal::IfParcelable<P> AParcel_writeVector(AParcel* parcel,
                                                            const std::vector<P>& vec) {
    return AParcel_writeParcelableArray(parcel, static_cast<const void*>(&vec),
                                        static_cast<int32_t>(vec.size()),
                                        AParcel_writeStdVectorParcelableElement<P>);
}

template <typename P>
static inline internal::IfParcelable<P> AParcel_readVector(const AParcel* parcel,
                                                           std::vector<P>* vec) {
    return AParcel_readParcelableArray(parcel, static_cast<void*>(vec),
                                       AParcel_stdVectorExternalAllocator<P>,
                                       AParcel_readStdVectorParcelableElement<P>);
}

// Resizes a vector to a length read from the parcel, checking it against the data left.
template <typename T>
static inline binder_status_t AParcel_resizeVector(const AParcel* parcel, std::vector<T>* vec) {
    int32_t size;
    binder_status_t err = AParcel_readInt32(parcel, &size);
    if (err != STATUS_OK) return err;
    if (size < 0) return STATUS_UNEXPECTED_NULL;
    if (size > AParcel_getDataSize(parcel) - AParcel_getDataPosition(parcel)) {
        return STATUS_NOT_ENOUGH_DATA;
    }
    vec->resize(static_cast<size_t>(size));
    return STATUS_OK;
}

}  // namespace ndk
