// The fixture of the VelzipFile tests: a fresh JNI host and libTessel_JNI.dll per test (from
// HostTest), a VelzipClient on them, a temporary folder, and the log of interface calls of the
// stand-in libZelbrin.dll, which the test program links so that it sees what reached the
// library and in which order.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "host_fixture.h"
#include "temp_folder.h"
#include "velzip_client.h"
#include "zelbrin.h"

namespace testkit {

class VelzipTest : public HostTest {
protected:
    using Bytes = std::vector<uint8_t>;

    ~VelzipTest() override {
        ZelTest_FailWrites(0);  // a test that injected failures may have stopped early
        ZelTest_FailReads(0);
        ZelTest_EndLog();
        vz.close();  // the library lets go of its file before the folder is removed
    }
    // The stand-in's call log and the host's JNI call counts start afresh.
    void mark() {
        ZelTest_BeginLog();
        vm.resetCallCounts();
    }
    // Space-separated entries such as "exist canread open(1,1) getfid" since mark().
    std::string log() { return ZelTest_Log(); }
    // Opens the empty path: afterwards the record is id 2 and no file is open, and the library
    // was not called.
    void forget() { vz.open("", 1); }
    // `name` in the folder: a Velzip file of `content` written through the exports, with
    // `change` applied to its bytes; its UTF-8 path, or empty when it could not be written.
    std::string alteredFile(const std::string& name, const Bytes& content,
                            const std::function<void(Bytes&)>& change) {
        if (!vz.writeFile(dir.file("original.vz"), content)) {
            return {};
        }
        Bytes file = readAll(dir.wfile("original.vz"));
        change(file);
        return writeAll(dir.wfile(name), file) ? dir.file(name) : std::string();
    }

    VelzipClient vz{vm, lib};
    TempFolder dir;
};

}  // namespace testkit
