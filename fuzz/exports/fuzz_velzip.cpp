// The VelzipFile family under fuzz: open, read, write and close in random order on whole,
// damaged and missing files, with adversarial paths, arrays and lengths. Every call's result
// and the failure record after it are predicted by the model (velzip_model.h).
#include <cctype>
#include <cstring>

#include "fuzz_case.h"
#include "fuzz_run.h"
#include "velzip_client.h"
#include "velzip_model.h"
#include "zelbrin.h"

namespace fuzz {

namespace {

namespace vz = testkit::vz;

std::string text(Case& c, jobject s) {
    return s == nullptr ? "null" : show(c.vm.stringValue(s));
}

// The failure record against the model; the message on a third of the calls (it costs a
// Java string).
void checkRecord(Case& c, const VelzipModel& m) {
    const int id = c.call<jint>(vz::kErrorId);
    c.expect(id == m.errorId, [&] {
        return "getErrorIdN gave " + std::to_string(id) + ", expected " + std::to_string(m.errorId);
    });
    if (id != m.errorId || !c.rng.chance(33)) {
        return;
    }
    jstring msg = c.call<jstring>(vz::kErrorMsg);
    if (m.errorId == 0) {
        c.expect(msg == nullptr, [&] { return "getErrorMsgN gave " + text(c, msg) + " with no failure"; });
        return;
    }
    const std::u16string got = msg ? c.vm.stringValue(msg) : u"<null>";
    bool ok = got == m.errorMsg;
    if (!ok && m.errorNumber < 0) {  // "Error: <n> reading encoded input file."
        const std::u16string head = u"Error: ", tail = u" reading encoded input file.";
        ok = got.size() > head.size() + tail.size() && got.compare(0, head.size(), head) == 0 &&
             got.compare(got.size() - tail.size(), tail.size(), tail) == 0;
    }
    c.expect(ok, [&] { return "getErrorMsgN gave " + show(got) + ", expected " + show(m.errorMsg); });
}

// The stand-in's own count of open streams, and its count of compressors: the library makes
// one, once.
void checkLibraryState(Case& c, const Run& run, const VelzipModel& m) {
    const int live = ZelTest_LiveStreams();
    const int want = m.mode == VelzipModel::None ? 0 : 1;
    c.expect(live == want, [&] {
        return "the stand-in holds " + std::to_string(live) + " open streams, expected " +
               std::to_string(want);
    });
    const int made = ZelTest_CompressorsCreated() - run.compressorsBefore;
    c.expect(made <= 1, [&] { return std::to_string(made) + " compressors made by the library"; });
}

// The reset of every open: streams still open are closed, a written file completed. Its bytes
// are read from disk when a later open picks it, once the library has closed it.
void completeWrite(VelzipModel& m) {
    if (m.mode == VelzipModel::Writing) {
        FileImage f;
        f.label = "written in this case";
        f.path = m.writePath;
        f.intact = m.writeBroken == 0;
        f.content = m.written;
        f.linesSafe = f.intact && isModifiedUtf8(f.content.data(), f.content.size());
        for (auto& old : m.writtenFiles) {
            if (upperCase(old.path) == upperCase(f.path)) {
                old = f;
                f.path.clear();
            }
        }
        if (!f.path.empty()) {
            m.writtenFiles.push_back(f);
        }
    }
    m.mode = VelzipModel::None;
}

bool decodable(const std::u16string& path) {
    if (path.empty()) {
        return false;
    }
    for (size_t i = 0; i < path.size(); ++i) {
        const char16_t u = path[i];
        if (u == 0) {
            return false;
        }
        if (u >= 0xD800 && u < 0xDC00) {
            if (i + 1 >= path.size() || path[i + 1] < 0xDC00 || path[i + 1] >= 0xE000) {
                return false;
            }
            ++i;
        } else if (u >= 0xDC00 && u < 0xE000) {
            return false;
        }
    }
    return true;
}

// A file name of odd characters (long ones too) that stays in the scratch folder.
std::u16string oddName(Case& c) {
    std::u16string name = nameText(c.rng, false);
    for (auto& u : name) {
        if (u == u'\\' || u == u'/') {
            u = u'_';
        }
    }
    return name;
}

// A name of plain letters in the scratch folder: writable, so its open must succeed.
std::u16string plainScratch(Case& c, const Run& run) {
    return run.scratch + u"\\w" + plainText(c.rng, c.rng.range(1, 12)) + u".vz";
}

void opOpenForRead(Case& c, Run& run, VelzipModel& m) {
    completeWrite(m);  // first, so that a file being written is picked with its new content
    FileImage target;
    bool written = false;
    const uint32_t pick = c.rng.below(10);
    if (pick < 5 || (pick < 7 && m.writtenFiles.empty())) {
        target = c.rng.pick(run.corpus);
    } else if (pick < 7) {
        target = c.rng.pick(m.writtenFiles);
        written = true;
    } else {  // a path nothing is at: odd characters, long, NUL, lone surrogates
        target.label = "odd path";
        target.kind = FileImage::Missing;
        target.path = run.scratch + u"\\r" + oddName(c);
    }
    static const jboolean readValues[] = {0, 2, 0x80, 0xFF};
    const jboolean forWrite = readValues[c.rng.below(4)];
    const bool opened = c.call<jboolean>(vz::kOpen, c.vm.newString(target.path), forWrite) == JNI_TRUE;
    if (written) {
        target.bytes =
            testkit::readAll(wide(target.path));  // complete now: the open's reset closed its writer
    }

    int id = 0;
    if (!decodable(target.path) || target.kind == FileImage::Missing) {
        id = 5;
    } else if (target.kind == FileImage::Folder) {
        id = 4;
    } else if (target.bytes.size() < 16 || !hasMagic(target.bytes.data())) {
        id = 3;
    }
    c.expect(opened == (id == 0), [&] {
        return "openFileN(" + show(target.path) + " [" + target.label + "], " + std::to_string(forWrite) +
               ") gave " + (opened ? "true" : "false") + ", expected failure id " + std::to_string(id);
    });
    if (id != 0) {
        m.record(id, velzipMessage(id, target.path));
        return;
    }
    m.record(0, u"");
    m.mode = VelzipModel::Reading;
    m.reading = target;
    m.position = 0;
    m.readBroken = target.intact ? 0 : -1;
}

void opOpenForWrite(Case& c, Run& run, VelzipModel& m) {
    std::u16string path;
    bool mustOpen = false;
    switch (c.rng.below(8)) {
        case 0:
            path = u16(run.dir.wpath());  // a folder
            break;
        case 1:
            path = run.scratch + u"\\no-such-folder\\x.vz";
            break;
        case 2:
        case 3:
            path = run.scratch + u"\\w" + oddName(c);
            break;
        default:
            path = m.writtenFiles.empty() || c.rng.chance(50) ? plainScratch(c, run)
                                                              : c.rng.pick(m.writtenFiles).path;
            mustOpen = true;
    }
    completeWrite(m);
    const bool opened = c.call<jboolean>(vz::kOpen, c.vm.newString(path), jboolean{1}) == JNI_TRUE;
    const bool mustFail = path.find(u"no-such-folder") != std::u16string::npos ||
                          path == u16(run.dir.wpath()) || !decodable(path);
    c.expect(!(mustOpen && !opened) && !(mustFail && opened),
             [&] { return "openFileN(" + show(path) + ", 1) gave " + (opened ? "true" : "false"); });
    if (opened) {
        m.record(0, u"");
        m.mode = VelzipModel::Writing;
        m.writePath = path;
        m.written.clear();
        m.writeBroken = 0;
        return;
    }
    // Refused by the probe (7) or by the open itself (6); which one, the file system decides.
    const int id = c.call<jint>(vz::kErrorId);
    c.expect(id == 6 || id == 7 || mustFail,
             [&] { return "openFileN for writing failed with id " + std::to_string(id); });
    m.record(mustFail ? 7 : id, velzipMessage(mustFail ? 7 : id, path));
}

void opOpenOdd(Case& c, VelzipModel& m) {
    const bool null = c.rng.chance(50);
    completeWrite(m);
    const bool opened = c.call<jboolean>(vz::kOpen, null ? jstring{} : c.vm.newString(u""),
                                         jboolean(c.rng.below(3))) == JNI_TRUE;
    c.expect(!opened, [&] { return std::string("openFileN of ") + (null ? "null" : "\"\"") + " gave true"; });
    m.record(null ? 1 : 2, velzipMessage(null ? 1 : 2));
}

void opClose(Case& c, VelzipModel& m) {
    completeWrite(m);
    const bool closed = c.call<jboolean>(vz::kClose) == JNI_TRUE;
    c.expect(closed, [] { return "closeFileN gave false"; });
}

// A failure injected into the stand-in for the next stream operation: 0 for none.
int injectedError(Case& c) {
    return c.rng.chance(6) ? static_cast<int>(c.rng.range(1, 11)) : 0;
}

void opPrintLine(Case& c, VelzipModel& m) {
    const bool null = c.rng.chance(10);
    const std::u16string line = null ? u"" : anyText(c.rng) + (c.rng.chance(70) ? u"\n" : u"");
    const int inject = m.mode == VelzipModel::Writing ? injectedError(c) : 0;
    ZelTest_FailWrites(inject);
    const bool ok = c.call<jboolean>(vz::kPrintLine, null ? jstring{} : c.vm.newString(line)) == JNI_TRUE;
    ZelTest_FailWrites(0);
    bool want = false;
    if (m.mode != VelzipModel::Writing) {
        m.record(8, velzipMessage(8));
    } else if (!null) {
        if (m.writeBroken == 0) {
            m.writeBroken = inject;
        }
        if (m.writeBroken != 0) {
            m.record(12, velzipMessage(12, u"", m.writeBroken), m.writeBroken);
        } else {
            const std::string bytes = modifiedUtf8(line);
            m.written.insert(m.written.end(), bytes.begin(), bytes.end());
            want = true;
        }
    }
    c.expect(ok == want, [&] {
        return "printLineN(" + (null ? std::string("null") : show(line)) + ") gave " +
               (ok ? "true" : "false");
    });
}

// A byte array for the block calls: null, empty, or bytes of some size.
jbyteArray anyArray(Case& c, Bytes* bytes) {
    if (c.rng.chance(8)) {
        bytes->clear();
        return nullptr;
    }
    *bytes = randomBytes(c.rng, c.rng.chance(10) ? 0 : c.rng.range(1, c.rng.chance(10) ? 70000 : 3000));
    return c.vm.newByteArray(*bytes);
}

bool blockArgsFit(jbyteArray array, const Bytes& bytes, jint length) {
    return array != nullptr && length >= 0 && static_cast<size_t>(length) <= bytes.size();
}

void opWriteData(Case& c, VelzipModel& m) {
    Bytes bytes;
    jbyteArray array = anyArray(c, &bytes);
    const jint length = anyLength(c.rng, static_cast<jint>(bytes.size()));
    const bool fits = blockArgsFit(array, bytes, length);
    const int inject = m.mode == VelzipModel::Writing && fits ? injectedError(c) : 0;
    ZelTest_FailWrites(inject);
    const int got = c.call<jint>(vz::kWriteData, array, length);
    ZelTest_FailWrites(0);
    int want = -1;
    if (m.mode != VelzipModel::Writing) {
        m.record(8, velzipMessage(8));
    } else if (!fits) {
        want = 0;
        m.record(14, velzipMessage(14));
    } else {
        if (m.writeBroken == 0) {
            m.writeBroken = inject;
        }
        want = m.writeBroken == 0 ? 1 : 0;
        if (want == 1) {
            m.written.insert(m.written.end(), bytes.begin(), bytes.begin() + length);
        }
    }
    c.expect(got == want, [&] {
        return "writeDataN(" + (array ? showBytes(bytes) : std::string("null")) + ", " +
               std::to_string(length) + ") gave " + std::to_string(got) + ", expected " +
               std::to_string(want);
    });
    if (array != nullptr) {
        const Bytes after = c.vm.byteArrayValue(array);
        c.expect(after == bytes, [] { return "writeDataN changed its data array"; });
    }
}

// What one read of up to `count` bytes delivers from an intact file: up to and including the
// next line feed (the library opens in line mode), never more than is left.
size_t chunk(const VelzipModel& m, size_t count) {
    const Bytes& data = m.reading.content;
    size_t end = m.position;
    while (end < data.size() && end - m.position < count) {
        if (data[end++] == '\n') {
            break;
        }
    }
    return end - m.position;
}

void opReadData(Case& c, VelzipModel& m) {
    Bytes before;
    jbyteArray array = anyArray(c, &before);
    const jint length = anyLength(c.rng, static_cast<jint>(before.size()));
    const bool fits = blockArgsFit(array, before, length);
    const bool intact = m.mode == VelzipModel::Reading && m.readBroken >= 0;
    const size_t n = intact && fits && m.readBroken == 0 ? chunk(m, static_cast<size_t>(length)) : 0;
    const int inject = intact && fits && length > 0 ? injectedError(c) : 0;
    ZelTest_FailReads(inject);
    const int got = c.call<jint>(vz::kReadData, array, length);
    ZelTest_FailReads(0);
    const Bytes after = array ? c.vm.byteArrayValue(array) : Bytes();
    auto report = [&](const std::string& want) {
        return "readDataN(" + (array ? showBytes(before) : std::string("null")) + ", " +
               std::to_string(length) + ") on " + m.reading.label + " gave " + std::to_string(got) +
               ", expected " + want;
    };
    if (m.mode != VelzipModel::Reading) {
        c.expect(got == -1, [&] { return report("-1"); });
        m.record(9, velzipMessage(9));
        return;
    }
    if (!fits) {
        c.expect(got == 0, [&] { return report("0"); });
        m.record(14, velzipMessage(14));
        return;
    }
    if (!intact) {  // a damaged file: any count up to the length, or 0 with its error
        c.expect(got >= 0 && got <= length, [&] { return report("0 to the length"); });
        if (got == 0 && c.call<jint>(vz::kErrorId) == 13) {
            m.record(13, u"", -1);
        }
        return;
    }
    const int error = m.readBroken != 0 ? m.readBroken : inject;
    const int want = error != 0 || length == 0 ? 0 : static_cast<int>(n);
    c.expect(got == want, [&] { return report(std::to_string(want)); });
    const Bytes& data = m.reading.content;
    bool same = after.size() == before.size();
    for (size_t i = 0; same && i < after.size(); ++i) {
        same = after[i] == (i < n ? data[m.position + i] : before[i]);
    }
    c.expect(same, [&] {
        return report("the next " + std::to_string(n) + " bytes in the array") + ": array differs";
    });
    m.position += n;
    if (error != 0) {
        m.record(13, velzipMessage(13, u"", error), error);
    }
}

void opReadLine(Case& c, VelzipModel& m) {
    const bool reading = m.mode == VelzipModel::Reading;
    if (reading && (!m.reading.linesSafe || m.readBroken < 0)) {
        // Binary or unknown bytes are no modified UTF-8, and readLineN hands them to
        // NewStringUTF as they are; Java reads only text files by line.
        return;
    }
    const size_t n = reading && m.readBroken == 0 ? chunk(m, 2047) : 0;
    Bytes line;
    std::u16string want;
    if (reading) {
        line.assign(m.reading.content.begin() + m.position, m.reading.content.begin() + m.position + n);
        if (!isModifiedUtf8(line.data(), line.size(), &want)) {
            // A line longer than 2047 bytes is cut there, possibly inside a character, and
            // readLineN hands that to NewStringUTF as it is (left as designed; not drawn).
            return;
        }
    }
    const int inject = reading && n > 0 && m.readBroken == 0 ? injectedError(c) : 0;
    ZelTest_FailReads(inject);
    jstring got = c.call<jstring>(vz::kReadLine);
    ZelTest_FailReads(0);
    const bool wantNull = !reading || n == 0 || inject != 0;
    c.expect(wantNull ? got == nullptr : got != nullptr && c.vm.stringValue(got) == want, [&] {
        return "readLineN on " + (reading ? m.reading.label : std::string("no file")) + " gave " +
               text(c, got) + ", expected " + (wantNull ? "null" : show(want));
    });
    if (!reading) {
        m.record(9, velzipMessage(9));
    } else if (inject != 0) {
        m.record(13, velzipMessage(13, u"", inject), inject);
    }
    m.position += n;
}

void opFileQueries(Case& c, VelzipModel& m) {
    const uint8_t* header = m.mode == VelzipModel::Reading ? m.reading.bytes.data() : nullptr;
    switch (c.rng.below(4)) {
        case 0: {
            const bool got = c.call<jboolean>(vz::kIsZip) == JNI_TRUE;
            bool want = m.mode == VelzipModel::Writing;
            if (header) {
                const std::string v = versionText(header);
                want = v.size() == 2 && isdigit(v[0]) && isdigit(v[1]) &&
                       m.reading.bytes.size() == 16 + uint64_t{le32(header + 8)};
            }
            c.expect(got == want,
                     [&] { return "isVelmorZipN on " + m.reading.label + " gave " + std::to_string(got); });
            break;
        }
        case 1: {
            const bool got = c.call<jboolean>(vz::kIsEncrypted) == JNI_TRUE;
            const bool want = header && versionText(header) != "00";
            c.expect(got == want, [&] { return "isVelmorEncryptedN gave " + std::to_string(got); });
            if (!header) {
                m.record(9, velzipMessage(9));
            }
            return;
        }
        default: {
            const bool compressed = c.rng.chance(50);
            const int got = c.call<jint>(compressed ? vz::kCompressedOfFile : vz::kUncompressedOfFile);
            if (header) {
                const jint want = static_cast<jint>(le32(header + (compressed ? 8 : 12)));
                c.expect(got == want, [&] {
                    return std::string(compressed ? "compressed" : "uncompressed") + " byte count of " +
                           m.reading.label + " gave " + std::to_string(got) + ", expected " +
                           std::to_string(want);
                });
            } else if (m.mode == VelzipModel::Writing && !compressed) {
                c.expect(got == static_cast<jint>(m.written.size()), [&] {
                    return "getNumUncompressedBytesN while writing gave " + std::to_string(got) + " after " +
                           std::to_string(m.written.size()) + " bytes";
                });
            } else if (m.mode == VelzipModel::None) {
                c.expect(got == 0, [&] { return "a byte count with no file gave " + std::to_string(got); });
            }
            break;
        }
    }
    if (m.mode == VelzipModel::None) {
        m.record(9, velzipMessage(9));
    }
}

}  // namespace

void opHeaderQueries(Case& c, const Run& run, VelzipModel& m);
void opCodec(Case& c, VelzipModel& m);

void fuzzVelzip(Case& c, Run& run) {
    c.family = "velzip";
    VelzipModel m;
    // A known start: nothing open, failure record id 2, and no file left from another case.
    c.call<jboolean>(vz::kClose);
    c.call<jboolean>(vz::kOpen, c.vm.newString(u""), jboolean{1});
    m.record(2, velzipMessage(2));
    testkit::removeTree(wide(run.scratch));
    CreateDirectoryW(wide(run.scratch).c_str(), nullptr);

    const int steps = static_cast<int>(c.rng.range(1, 40));
    for (int i = 0; i < steps && c.failures.empty(); ++i) {
        const uint32_t op = c.rng.below(100);
        if (op < 12) {
            opOpenForRead(c, run, m);
        } else if (op < 20) {
            opOpenForWrite(c, run, m);
        } else if (op < 23) {
            opOpenOdd(c, m);
        } else if (op < 30) {
            opClose(c, m);
        } else if (op < 40) {
            opPrintLine(c, m);
        } else if (op < 50) {
            opWriteData(c, m);
        } else if (op < 62) {
            opReadData(c, m);
        } else if (op < 70) {
            opReadLine(c, m);
        } else if (op < 78) {
            opFileQueries(c, m);
        } else if (op < 86) {
            opHeaderQueries(c, run, m);
        } else {
            opCodec(c, m);
        }
        checkRecord(c, m);
        checkLibraryState(c, run, m);
    }
    c.call<jboolean>(vz::kClose);
}

}  // namespace fuzz
