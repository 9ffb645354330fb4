// Collects the JNI host's violation reports instead of failing the test at once, for tests
// that break a JNI rule on purpose and must see the host notice it (the host's own checks
// are only worth something if each one is known to fire).
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "jnihost.h"

class ViolationLog {
public:
    explicit ViolationLog(jnihost::Vm& vm) : vm_(vm) {
        vm_.setViolationHandler([this](const std::string& what) { seen_.push_back(what); });
    }
    // Back to the host's default handler, which outlives this log.
    ~ViolationLog() { vm_.setViolationHandler({}); }
    ViolationLog(const ViolationLog&) = delete;
    ViolationLog& operator=(const ViolationLog&) = delete;

    // Success when a violation reported since the last check mentions `fragment`; the
    // failure lists all of them. Either way the log starts empty again.
    ::testing::AssertionResult reported(const std::string& fragment) {
        const std::vector<std::string> all = std::exchange(seen_, {});
        for (const std::string& v : all) {
            if (v.find(fragment) != std::string::npos) {
                return ::testing::AssertionSuccess();
            }
        }
        return listed(::testing::AssertionFailure() << "no violation mentions \"" << fragment << "\"; got:",
                      all);
    }

    // Success when nothing was reported since the last check.
    ::testing::AssertionResult none() {
        const std::vector<std::string> all = std::exchange(seen_, {});
        return all.empty() ? ::testing::AssertionSuccess()
                           : listed(::testing::AssertionFailure() << "got:", all);
    }

private:
    static ::testing::AssertionResult listed(::testing::AssertionResult r,
                                             const std::vector<std::string>& all) {
        for (const std::string& v : all) {
            r << "\n  " << v;
        }
        return r;
    }

    jnihost::Vm& vm_;
    std::vector<std::string> seen_;
};
