#pragma once

#include "tests/gl/EglContext.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>

namespace qivo {

/// A test with a context of its own, 64 x 48 pixels, that must leave no GL error behind.
class ContextTest : public testing::Test {
  protected:
    static constexpr int width = 64;
    static constexpr int height = 48;

    std::unique_ptr<EglContext> context;

    void SetUp() override {
        std::string error;
        context = EglContext::create(width, height, error);
        ASSERT_TRUE(context) << error;
    }

    void TearDown() override {
        if (context) {
            EXPECT_THAT(takeGlErrors(), testing::IsEmpty());
        }
    }
};

} // namespace qivo
