// The soak's loops, one per family; each checks enough of what it gets back to know that the
// work was really done (a loop that fails early would measure nothing).
#include <windows.h>

#include <algorithm>
#include <cstring>

#include "chooser_client.h"
#include "desktop_client.h"
#include "registry_kit.h"
#include "sample_data.h"
#include "soak.h"
#include "velzip_client.h"

namespace soak {

namespace {

using namespace testkit::desktop;

constexpr jint kCurrentUser = static_cast<jint>(0x80000001);

// The message of a pending exception, cleared; empty when none.
std::string takeException(Host& h) {
    if (!h.vm.exceptionPending()) {
        return {};
    }
    const std::string message = h.vm.pendingException().message;
    h.vm.clearException();
    return message;
}

}  // namespace

Host::Host() = default;

void Context::fault(const std::string& what) {
    static std::mutex mu;
    std::lock_guard<std::mutex> lock(mu);
    if (++faults <= 5) {
        std::printf("soak: FAULT %s\n", what.c_str());
        std::fflush(stdout);
    }
}

// A bulk write of 20 values, a bulk read of them, one value written, read, deleted and
// missed, and now and then a small tree created and deleted recursively.
long registryRound(Host& h, Context& ctx, long calls) {
    jstring key = h.vm.newStringUtf8(ctx.registryKey);
    jstring sub = h.vm.newStringUtf8(ctx.registryKey + "\\tree");
    jstring deep = h.vm.newStringUtf8(ctx.registryKey + "\\tree\\a\\b");
    long made = 0;
    for (int i = 0; made < calls; ++i) {
        jobject table = h.vm.newHashtable();
        for (int k = 0; k < 20; ++k) {
            jobject value = k % 3 == 0 ? h.vm.newStringUtf8("text " + std::to_string(k * i))
                            : k % 3 == 1
                                ? h.vm.newInteger(k * i)
                                : h.vm.newByteArray(std::vector<uint8_t>(k * 10, static_cast<uint8_t>(i)));
            h.vm.hashtablePut(table, h.vm.newStringUtf8("v" + std::to_string(k)), value);
        }
        h.lib.call<void>(regkit::kSetValues, jclass{}, kCurrentUser, key, table);
        jobject all = h.lib.call<jobject>(regkit::kGetValues, jclass{}, kCurrentUser, key);
        if (all == nullptr || h.vm.hashtableEntries(all).size() != 20) {
            ctx.fault("the bulk read did not give the 20 values written");
        }
        jstring name = h.vm.newStringUtf8("single");
        h.lib.call<void>(regkit::kSetValue, jclass{}, kCurrentUser, key, name,
                         h.vm.newStringUtf8("one value"));
        jobject one = h.lib.call<jobject>(regkit::kGetValue, jclass{}, kCurrentUser, key, name);
        if (one == nullptr || h.vm.stringUtf8(one) != "one value") {
            ctx.fault("a single value did not read back");
        }
        h.lib.call<void>(regkit::kDeleteValue, jclass{}, kCurrentUser, key, name);
        h.lib.call<jobject>(regkit::kGetValue, jclass{}, kCurrentUser, key, name);
        if (takeException(h) != "RegQueryValueEx() call failed") {
            ctx.fault("a deleted value was still read");
        }
        made += 6;
        if (i % 5 == 0) {
            h.lib.call<void>(regkit::kSetValue, jclass{}, kCurrentUser, deep, name, h.vm.newInteger(i));
            h.lib.call<void>(regkit::kDeleteKey, jclass{}, kCurrentUser, sub, jboolean{1});
            if (!takeException(h).empty() || regkit::keyExists(ctx.registryKey + "\\tree")) {
                ctx.fault("the recursive delete left the tree");
            }
            made += 2;
        }
        if (!takeException(h).empty()) {
            ctx.fault("a registry call raised");
        }
    }
    return made;
}

// A file written as lines and blocks, read back as lines and blocks, asked about, closed;
// then a missing file opened (a formatted failure message) and its message read.
long velzipRound(Host& h, Context& ctx, long calls) {
    std::lock_guard<std::mutex> turn(ctx.velzipTurn);
    testkit::VelzipClient vz(h.vm, h.lib);
    const std::string path = ctx.dir.file("soak.vz");
    const std::vector<uint8_t> block = testkit::sampleData(3000, true, 5);
    jbyteArray buffer = h.vm.newByteArray(std::vector<uint8_t>(4096));
    long made = 0;
    while (made < calls) {
        bool ok = vz.open(path, 1);
        for (int k = 0; k < 3; ++k) {
            ok = vz.printLine("line " + std::to_string(k) + "\n") && ok;
        }
        ok = vz.writeData(block) == 1 && ok;
        vz.close();
        ok = vz.open(path, 0) && ok;
        int lines = 0;
        while (vz.readLine() && lines < 10) {
            ++lines;
        }
        int n;
        while ((n = vz.readData(buffer, 4096)) > 0) {
            ++made;
        }
        ok = ok && lines >= 3 && n == 0 && vz.boolCall(testkit::vz::kIsZip) &&
             vz.intCall(testkit::vz::kUncompressedOfFile) == static_cast<int>(21 + block.size());
        vz.close();
        ok = !vz.open(ctx.dir.file("missing.vz"), 0) && vz.errorId() == 5 && vz.errorMsg().has_value() && ok;
        if (!ok) {
            ctx.fault("a Velzip write/read/close cycle did not work");
        }
        made += 15 + lines;
    }
    return made;
}

// Pairs of encodeMemN and decodeMemN of random sizes up to 64 KiB, every fourth encode refused
// (a destination one byte short), and the header queries on the output.
long codecRound(Host& h, Context& ctx, long calls) {
    std::lock_guard<std::mutex> turn(ctx.velzipTurn);
    testkit::VelzipClient vz(h.vm, h.lib);
    long made = 0;
    for (int i = 0; made < calls; ++i) {
        const size_t size = ctx.next() % 65536;
        const std::vector<uint8_t> data = testkit::sampleData(size, i % 2 == 0, ctx.next());
        const jint bound = static_cast<jint>(size * 1.01 + 36.0);
        jbyteArray src = h.vm.newByteArray(data);
        jbyteArray packed = h.vm.newByteArray(std::vector<uint8_t>(bound));
        if (i % 4 == 0 && vz.encode(packed, bound - 1, src, static_cast<jint>(size)) != 0) {
            ctx.fault("encodeMemN accepted a destination one byte short");
        }
        const int n = vz.encode(packed, bound, src, static_cast<jint>(size));
        // decodeMemN asks for room beyond the compressed size, which random data exceeds.
        const jint room = static_cast<jint>(size + n * 1.01 + 37.0);
        jbyteArray back = h.vm.newByteArray(std::vector<uint8_t>(room));
        const int m = vz.decode(back, room, packed, n);
        std::vector<uint8_t> got = h.vm.byteArrayValue(back);
        got.resize(m > 0 ? m : 0);
        if (n <= 0 || got != data ||
            vz.headerCall(testkit::vz::kUncompressedOfHeader, packed) != static_cast<int>(size)) {
            ctx.fault("a codec pair did not give the data back");
        }
        vz.headerCall(testkit::vz::kSizeofUnCompressed, packed);
        made += 5 + (i % 4 == 0 ? 1 : 0);
    }
    return made;
}

// Environment variables (defined and not), shell folders (real and rejected ids), cursor moves.
long desktopRound(Host& h, Context& ctx, long calls) {
    SetEnvironmentVariableA("TESSEL_SOAK_VAR", "soak value");
    jstring defined = h.vm.newStringUtf8("TESSEL_SOAK_VAR");
    jstring undefined = h.vm.newStringUtf8("TESSEL_SOAK_UNDEFINED");
    long made = 0;
    for (int i = 0; made < calls; ++i) {
        jobject value = h.lib.call<jstring>(kGetEnv, jclass{}, defined);
        const bool envOk = value != nullptr && h.vm.stringUtf8(value) == "soak value" &&
                           h.lib.call<jstring>(kGetEnv, jclass{}, undefined) == nullptr;
        const bool folderOk = h.lib.call<jstring>(kSpecialFolder, jclass{}, jint{5}) != nullptr &&
                              h.lib.call<jstring>(kSpecialFolder, jclass{}, jint{26}) != nullptr &&
                              h.lib.call<jstring>(kSpecialFolder, jclass{}, jint{0xFF}) == nullptr;
        const jint x = 100 + i % 500, y = 100 + i % 300;
        const bool moved = h.lib.call<jboolean>(kSetCursorPos, jclass{}, h.vm.newPoint(x, y)) == JNI_TRUE;
        jobject point = h.lib.call<jobject>(kGetCursorPos, jclass{});
        if (!envOk || !folderOk || !moved || point == nullptr ||
            h.vm.pointValue(point) != std::pair<int32_t, int32_t>(x, y)) {
            ctx.fault("a desktop call gave a wrong result");
        }
        made += 7;
    }
    return made;
}

// Status texts and raises to the soak's own live window, and to a stale handle and 0.
long windowsRound(Host& h, Context& ctx, long calls) {
    const HWND own = ctx.window->handle();
    const jlong live = static_cast<jlong>(static_cast<int32_t>(reinterpret_cast<intptr_t>(own)));
    const jlong stale = static_cast<jlong>(
        static_cast<int32_t>(reinterpret_cast<intptr_t>(testkit::StatusWindow::staleHandle())));
    jobject chooser = h.vm.newInstance(jnihost::kDirectoryChooserClass);
    jobject gone = h.vm.newInstance(jnihost::kDirectoryChooserClass);
    h.vm.setLongField(chooser, "hwnd", live);
    h.vm.setLongField(gone, "hwnd", stale);
    long made = 0;
    for (int i = 0; made < calls; ++i) {
        ctx.window->clear();
        h.lib.call<void>(testkit::chooser::kSetStatus, chooser,
                         h.vm.newStringUtf8("status " + std::to_string(i)));
        h.lib.call<void>(testkit::chooser::kSetStatus, gone, h.vm.newStringUtf8("dropped"));
        h.lib.call<void>(testkit::chooser::kActivate, jclass{}, live);
        h.lib.call<void>(testkit::chooser::kActivate, jclass{}, jlong{0});
        if (ctx.window->received().size() != 1 ||
            ctx.window->received()[0] != "status " + std::to_string(i)) {
            ctx.fault("the status text did not reach the live window alone");
        }
        made += 4;
    }
    ctx.window->clear();
    return made;
}

}  // namespace soak
