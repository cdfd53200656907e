// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

// Descriptors in parcels, as the platform's NDK treats them: the parcel owns a duplicate of each,
// every read hands the reader another, and an entry that names none is refused without a leak.

#include <android/binder_parcel_utils.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <climits>
#include <string>
#include <vector>

#include "parcel.h"
#include "test_descriptors.h"

namespace vyr_test::binder {
namespace {

constexpr const char* kText = "parcel text\n";

// The same open file: what a duplicate shares with its original.
bool SameFile(int a, int b) {
    struct stat sa {};
    struct stat sb {};
    return fstat(a, &sa) == 0 && fstat(b, &sb) == 0 && sa.st_dev == sb.st_dev &&
           sa.st_ino == sb.st_ino;
}

class ParcelDescriptorTest : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_GE(file_.get(), 0); }
    void Rewind() { ASSERT_EQ(STATUS_OK, AParcel_setDataPosition(parcel_.get(), 0)); }
    // A read that must succeed, owned by the caller.
    ndk::ScopedFileDescriptor Read() {
        int fd = -7;
        EXPECT_EQ(STATUS_OK, AParcel_readParcelFileDescriptor(parcel_.get(), &fd));
        return ndk::ScopedFileDescriptor(fd);
    }

    ndk::ScopedAParcel parcel_{AParcel_create()};
    ndk::ScopedFileDescriptor file_ = MakeTextFile("vyr.parcel.test", kText);
};

TEST_F(ParcelDescriptorTest, TheParcelKeepsADuplicateAndTheCallerItsOwn) {
    const size_t before = CountOwnDescriptors();
    ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel_.get(), file_.get()));
    EXPECT_EQ(before + 1, CountOwnDescriptors()) << "the parcel holds a duplicate of its own";
    ASSERT_EQ(1u, parcel_.get()->fds.size());
    const int copy = parcel_.get()->fds[0].get();
    EXPECT_NE(file_.get(), copy);
    EXPECT_TRUE(SameFile(file_.get(), copy));
    EXPECT_NE(0, fcntl(copy, F_GETFD) & FD_CLOEXEC);
    // The caller's descriptor is its own to close; the parcel's copy lives on.
    file_.set(-1);
    Rewind();
    ndk::ScopedFileDescriptor read = Read();
    EXPECT_EQ(kText, ReadText(read.get()));
}

TEST_F(ParcelDescriptorTest, EachReadHandsTheReaderADescriptorOfItsOwn) {
    ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel_.get(), file_.get()));
    const size_t before = CountOwnDescriptors();
    Rewind();
    ndk::ScopedFileDescriptor first = Read();
    Rewind();
    ndk::ScopedFileDescriptor second = Read();
    ASSERT_GE(first.get(), 0);
    ASSERT_GE(second.get(), 0);
    EXPECT_EQ(before + 2, CountOwnDescriptors());
    EXPECT_NE(first.get(), second.get());
    EXPECT_NE(first.get(), parcel_.get()->fds[0].get());
    EXPECT_TRUE(SameFile(first.get(), file_.get()));
    EXPECT_NE(0, fcntl(first.get(), F_GETFD) & FD_CLOEXEC);
    // The reader's descriptors outlive each other and the parcel.
    first.set(-1);
    parcel_.set(nullptr);
    EXPECT_EQ(before, CountOwnDescriptors()) << "one read descriptor left, the parcel's gone";
    EXPECT_EQ(kText, ReadText(second.get()));
}

TEST_F(ParcelDescriptorTest, DeletingOrResettingTheParcelClosesItsCopies) {
    const size_t before = CountOwnDescriptors();
    for (int i = 0; i < 3; ++i) {
        ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel_.get(), file_.get()));
    }
    EXPECT_EQ(before + 3, CountOwnDescriptors());
    ASSERT_EQ(STATUS_OK, AParcel_reset(parcel_.get()));
    EXPECT_EQ(before, CountOwnDescriptors());
    for (int i = 0; i < 2; ++i) {
        ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel_.get(), file_.get()));
    }
    EXPECT_EQ(before + 2, CountOwnDescriptors());
    parcel_.set(nullptr);
    EXPECT_EQ(before, CountOwnDescriptors());
}

TEST_F(ParcelDescriptorTest, NullIsMinusOneAndTheRequiredHelpersRefuseIt) {
    AParcel* p = parcel_.get();
    EXPECT_EQ(STATUS_UNEXPECTED_NULL,
              ndk::AParcel_writeRequiredParcelFileDescriptor(p, ndk::ScopedFileDescriptor()));
    EXPECT_EQ(0, AParcel_getDataSize(p));
    ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(p, -1));
    ASSERT_EQ(STATUS_OK,
              ndk::AParcel_writeNullableParcelFileDescriptor(p, ndk::ScopedFileDescriptor()));
    ASSERT_EQ(STATUS_OK, ndk::AParcel_writeNullableParcelFileDescriptor(p, file_));
    EXPECT_TRUE(p->fds.size() == 1) << "nulls take no descriptor";
    Rewind();
    ndk::ScopedFileDescriptor null = Read();
    EXPECT_EQ(-1, null.get());
    ndk::ScopedFileDescriptor required;
    EXPECT_EQ(STATUS_UNEXPECTED_NULL, ndk::AParcel_readRequiredParcelFileDescriptor(p, &required));
    EXPECT_EQ(-1, required.get());
    ndk::ScopedFileDescriptor nullable;
    ASSERT_EQ(STATUS_OK, ndk::AParcel_readNullableParcelFileDescriptor(p, &nullable));
    EXPECT_EQ(kText, ReadText(nullable.get()));
}

// The platform's NDK answers STATUS_UNKNOWN_ERROR for a negative descriptor other than -1, and
// libbinder's failed duplicate (-EBADF) is pruned to the same.
TEST_F(ParcelDescriptorTest, OtherNegativeAndClosedDescriptorsAreRefusedAsOnADevice) {
    AParcel* p = parcel_.get();
    EXPECT_EQ(STATUS_UNKNOWN_ERROR, AParcel_writeParcelFileDescriptor(p, -2));
    EXPECT_EQ(STATUS_UNKNOWN_ERROR, AParcel_writeParcelFileDescriptor(p, INT_MIN));
    int ends[2];
    ASSERT_EQ(0, pipe2(ends, O_CLOEXEC));
    close(ends[0]);
    close(ends[1]);
    EXPECT_EQ(STATUS_UNKNOWN_ERROR, AParcel_writeParcelFileDescriptor(p, ends[1]));
    EXPECT_EQ(0, AParcel_getDataSize(p)) << "a refused descriptor writes nothing";
    EXPECT_TRUE(p->fds.empty());
}

TEST_F(ParcelDescriptorTest, AnEntryThatNamesNoDescriptorIsRefusedAndLeaksNothing) {
    struct Case {
        const char* what;
        std::vector<int32_t> words;
        binder_status_t status;
    };
    const Case cases[] = {
        {"a marker neither 0 nor 1", {2, 0}, STATUS_BAD_VALUE},
        {"a negative marker", {-1, 0}, STATUS_BAD_VALUE},
        {"an index past the table", {1, 1}, STATUS_BAD_VALUE},
        {"a negative index", {1, -1}, STATUS_BAD_VALUE},
        {"a marker without its index", {1}, STATUS_NOT_ENOUGH_DATA},
        {"no entry at all", {}, STATUS_NOT_ENOUGH_DATA},
    };
    const size_t before = CountOwnDescriptors();
    for (const Case& c : cases) {
        // A parcel whose table holds one descriptor, then the entry under test.
        ndk::ScopedAParcel parcel(AParcel_create());
        ASSERT_EQ(STATUS_OK, AParcel_writeParcelFileDescriptor(parcel.get(), file_.get()));
        const int32_t entry = AParcel_getDataPosition(parcel.get());
        for (int32_t word : c.words) ASSERT_EQ(STATUS_OK, AParcel_writeInt32(parcel.get(), word));
        ASSERT_EQ(STATUS_OK, AParcel_setDataPosition(parcel.get(), entry));
        int fd = -7;
        EXPECT_EQ(c.status, AParcel_readParcelFileDescriptor(parcel.get(), &fd)) << c.what;
        EXPECT_EQ(-7, fd) << c.what << ": nothing handed out";
        EXPECT_EQ(before + 1, CountOwnDescriptors()) << c.what << ": only the parcel's copy";
    }
    EXPECT_EQ(before, CountOwnDescriptors());
}

}  // namespace
}  // namespace vyr_test::binder
