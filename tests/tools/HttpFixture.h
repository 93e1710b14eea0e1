#pragma once

#include "tests/tools/HttpClient.h"
#include "tools/publish/HttpServer.h"

#include <future>
#include <gtest/gtest.h>
#include <string>
#include <thread>

namespace qivo::test {

/// A test that serves on its own thread what its clients ask on another.
class HttpFixture : public testing::Test {
  protected:
    /// Serves until what a client does on another thread is done; gives what it gave.
    template <typename Act>
    auto serve(Act act) {
        auto done = std::async(std::launch::async, act);
        while (done.wait_for(std::chrono::milliseconds(1)) != std::future_status::ready) {
            while (g_main_context_iteration(nullptr, FALSE) != FALSE) {
            }
        }
        return done.get();
    }
};

} // namespace qivo::test
