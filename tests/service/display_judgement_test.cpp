// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#include <gtest/gtest.h>

#include <string>

#include "display_state.h"

namespace vyr_test::service {
namespace {

using android::vyr::binder::DisplayState;
using android::vyr::binder::JudgeDisplayState;
using android::vyr::binder::kDisplayStateBufferSize;

DisplayState Judge(const std::string& read) {
    return JudgeDisplayState(read.data(), read.size());
}

TEST(DisplayJudgementTest, OnAndHbmAreLitAnythingElseIsDark) {
    EXPECT_TRUE(Judge("On\n").lit);
    EXPECT_TRUE(Judge("HBM\n").lit);
    EXPECT_TRUE(Judge("LP: On").lit) << "named anywhere in the text";
    EXPECT_FALSE(Judge("Off\n").lit);
    EXPECT_FALSE(Judge("Doze\n").lit);
    EXPECT_FALSE(Judge("on\n").lit) << "the attribute's case is exact";
    EXPECT_FALSE(Judge("").lit);
}

TEST(DisplayJudgementTest, TheShownTextLosesOnlyItsTrailingNewlines) {
    const DisplayState state = Judge("On: 60\n\n");
    EXPECT_EQ(state.text, "On: 60\n\n");
    EXPECT_EQ(state.shown, "On: 60");
    EXPECT_EQ(Judge("\n\n").shown, "");
    EXPECT_EQ(Judge("a\nb\n").shown, "a\nb");
}

TEST(DisplayJudgementTest, TheTextEndsAtTheFirstNul) {
    const DisplayState state = Judge(std::string("Off\0On", 6));
    EXPECT_EQ(state.text, "Off");
    EXPECT_FALSE(state.lit) << "what follows a NUL is not read";
}

TEST(DisplayJudgementTest, AFullBufferKeepsItsLastByteForTheTerminator) {
    const std::string full(kDisplayStateBufferSize - 2, 'x');
    const DisplayState state = Judge(full + "On");
    EXPECT_EQ(state.text, full + "O");
    EXPECT_FALSE(state.lit) << "an \"On\" cut by the buffer is not seen";
    EXPECT_TRUE(Judge(full.substr(1) + "On").lit);
}

}  // namespace
}  // namespace vyr_test::service
