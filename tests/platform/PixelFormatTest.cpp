#include "platform/PixelFormat.h"

#include <gtest/gtest.h>

namespace qivo::test {
namespace {

TEST(PixelFormatTest, AskedForNothingItAsksForNothing) {
    const QSurfaceFormat format = PixelFormat::initWithAttributes({0}).surfaceFormat();
    EXPECT_EQ(format.swapBehavior(), QSurfaceFormat::SingleBuffer);
    EXPECT_EQ(format.depthBufferSize(), 0);
    EXPECT_EQ(format.stencilBufferSize(), 0);
    EXPECT_EQ(format.samples(), 0);
    EXPECT_EQ(format.alphaBufferSize(), -1);
}

TEST(PixelFormatTest, EveryAttribute) {
    const QSurfaceFormat format = PixelFormat::initWithAttributes({5, 8, 24, 11, 8, 99, 0x4100, 0}).surfaceFormat();
    EXPECT_EQ(format.swapBehavior(), QSurfaceFormat::DoubleBuffer);
    EXPECT_EQ(format.redBufferSize(), 8);
    EXPECT_EQ(format.greenBufferSize(), 8);
    EXPECT_EQ(format.blueBufferSize(), 8);
    EXPECT_EQ(format.alphaBufferSize(), 8);
    EXPECT_EQ(format.version(), qMakePair(4, 1));
    EXPECT_EQ(format.profile(), QSurfaceFormat::CoreProfile);
}

TEST(PixelFormatTest, WhatFollowsTheEndIsNotRead) {
    EXPECT_EQ(PixelFormat::initWithAttributes({0, 5}).surfaceFormat().swapBehavior(), QSurfaceFormat::SingleBuffer);
}

TEST(PixelFormatTest, AListThatBreaksOffIsTakenAsFarAsItGoes) {
    const QSurfaceFormat format = PixelFormat::initWithAttributes({5, 11}).surfaceFormat();
    EXPECT_EQ(format.swapBehavior(), QSurfaceFormat::DoubleBuffer);
    EXPECT_EQ(format.alphaBufferSize(), -1);
    EXPECT_EQ(PixelFormat::initWithAttributes({}).surfaceFormat().swapBehavior(), QSurfaceFormat::SingleBuffer);
}

TEST(PixelFormatTest, UnknownAttributesAreSkipped) {
    EXPECT_EQ(PixelFormat::initWithAttributes({77, 5, 0}).surfaceFormat().swapBehavior(), QSurfaceFormat::DoubleBuffer);
}

} // namespace
} // namespace qivo::test
