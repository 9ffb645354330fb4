// Each test gets a fresh JNI host and the library loaded through its real exports; any
// JNI rule the library breaks becomes a failure of that test.
#pragma once

#include <gtest/gtest.h>

#include "jnihost.h"

class HostTest : public ::testing::Test {
protected:
    HostTest() {
        vm.setViolationHandler([](const std::string& what) { ADD_FAILURE() << "JNI host: " << what; });
    }

    JNIEnv* env() { return vm.env(); }

    // The pending exception's class, cleared afterwards; empty when none was pending.
    std::string takeException() {
        if (!vm.exceptionPending()) {
            return {};
        }
        std::string name = vm.pendingException().className;
        vm.clearException();
        return name;
    }

    jnihost::Vm vm;
    jnihost::Library lib{vm};
};
