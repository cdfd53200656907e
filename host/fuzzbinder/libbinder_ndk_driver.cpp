// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <android/binder_parcel.h>
#include <fuzzbinder/libbinder_ndk_driver.h>

#include <cstdint>
#include <string>
#include <vector>

#include "parcel.h"

namespace android {
namespace {

// A binder of a class that no interface knows: what a confused or hostile peer would pass.
const AIBinder_Class* RandomBinderClass() {
    static const AIBinder_Class* clazz = AIBinder_Class_define(
        "vyr.fuzz.RandomBinder", [](void* args) { return args; }, [](void*) {},
        [](AIBinder*, transaction_code_t, const AParcel*, AParcel*) -> binder_status_t {
            return STATUS_OK;
        });
    return clazz;
}

// Appends values of the kinds that the interfaces read, in random order.
void FillParcel(AParcel* parcel, FuzzedDataProvider* provider) {
    while (provider->remaining_bytes() > 0 && !provider->ConsumeBool()) {
        switch (provider->ConsumeIntegralInRange<int>(0, 7)) {
            case 0:
                AParcel_writeInt32(parcel, provider->ConsumeIntegral<int32_t>());
                break;
            case 1:
                AParcel_writeInt64(parcel, provider->ConsumeIntegral<int64_t>());
                break;
            case 2:
                AParcel_writeFloat(parcel, provider->ConsumeFloatingPoint<float>());
                break;
            case 3:
                AParcel_writeBool(parcel, provider->ConsumeBool());
                break;
            case 4: {
                const std::string text = provider->ConsumeRandomLengthString(64);
                AParcel_writeString(parcel, text.data(), static_cast<int32_t>(text.size()));
                break;
            }
            case 5: {
                std::vector<int32_t> values(provider->ConsumeIntegralInRange(0, 16));
                for (int32_t& value : values) value = provider->ConsumeIntegral<int32_t>();
                AParcel_writeInt32Array(parcel, values.data(), static_cast<int32_t>(values.size()));
                break;
            }
            case 6: {
                AIBinder* binder =
                    provider->ConsumeBool() ? AIBinder_new(RandomBinderClass(), nullptr) : nullptr;
                AParcel_writeStrongBinder(parcel, binder);
                AIBinder_decStrong(binder);
                break;
            }
            default: {
                const std::vector<uint8_t> bytes =
                    provider->ConsumeBytes<uint8_t>(provider->ConsumeIntegralInRange(0, 64));
                parcel->Write(bytes.data(), bytes.size());
                break;
            }
        }
    }
}

}  // namespace

void fuzzService(AIBinder* binder, FuzzedDataProvider&& provider) {
    while (provider.remaining_bytes() > 0) {
        // Mostly the interface's own codes, so that the methods' bodies are reached.
        const transaction_code_t code =
            provider.ConsumeBool() ? provider.ConsumeIntegralInRange<transaction_code_t>(
                                         FIRST_CALL_TRANSACTION, FIRST_CALL_TRANSACTION + 10)
                                   : provider.ConsumeIntegral<transaction_code_t>();
        const binder_flags_t flags = provider.ConsumeBool() ? FLAG_ONEWAY : 0;
        AParcel* in = nullptr;
        if (AIBinder_prepareTransaction(binder, &in) != STATUS_OK) return;
        // Without the interface token the call must be refused before any method runs.
        if (provider.ConsumeIntegralInRange(0, 7) == 0) in->Clear();
        FillParcel(in, &provider);
        AParcel* out = nullptr;
        (void)AIBinder_transact(binder, code, &in, &out, flags);
        AParcel_delete(out);
    }
}

}  // namespace android
