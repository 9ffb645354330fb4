// The Velzip files of a fuzz run, built once from the run's seed.
#include <cstring>

#include "fuzz_run.h"
#include "sample_data.h"
#include "zelbrin.h"

namespace fuzz {

namespace {

constexpr size_t kHeader = 16;

Zel_Compress& codec() {
    static Zel_Compress* c = [] {
        auto* made = new Zel_Compress();  // lives as long as the run; the library's own is apart
        made->SetVersion(3, 8);
        made->SetCompressFlags(1, 0);
        return made;
    }();
    return *c;
}

void putLe32(Bytes& b, size_t at, uint32_t v) {
    for (int i = 0; i < 4; ++i) {
        b[at + i] = static_cast<uint8_t>(v >> (8 * i));
    }
}

// Text lines of varied length, some long, all well-formed modified UTF-8.
Bytes textLines(Rng& rng, int lines) {
    std::string out;
    for (int i = 0; i < lines; ++i) {
        const size_t length = rng.chance(10) ? rng.range(2000, 3000) : rng.range(0, 80);
        out += modifiedUtf8(rng.chance(70) ? plainText(rng, length) : anyText(rng).substr(0, length));
        out += '\n';
    }
    return Bytes(out.begin(), out.end());
}

FileImage whole(const std::string& label, const Bytes& data) {
    FileImage f;
    f.label = label;
    f.bytes = container(data);
    f.intact = true;
    f.content = data;
    f.linesSafe = isModifiedUtf8(data.data(), data.size());
    return f;
}

FileImage damaged(const std::string& label, Bytes bytes) {
    FileImage f;
    f.label = label;
    f.bytes = std::move(bytes);
    return f;
}

}  // namespace

Bytes container(const Bytes& data) {
    Bytes out(data.size() + data.size() / 100 + 64);
    const unsigned n = codec().Compress(out.data(), static_cast<unsigned>(out.size()), data.data(),
                                        static_cast<unsigned>(data.size()));
    out.resize(n);
    return out;
}

bool uncontainer(const Bytes& buffer, Bytes* data) {
    if (buffer.size() < kHeader || std::memcmp(buffer.data(), "VZL\x1a", 4) != 0) {
        return false;
    }
    uint32_t size = 0;
    std::memcpy(&size, buffer.data() + 12, 4);
    if (size > (64u << 20)) {
        return false;  // no buffer of the run is that large
    }
    data->assign(size + 1, 0);  // one spare byte, so an empty body still has a buffer
    const unsigned n = codec().UnCompress(data->data(), static_cast<unsigned>(data->size()), buffer.data(),
                                          static_cast<unsigned>(buffer.size()));
    data->resize(n);
    return n == size && (n > 0 || size == 0);
}

std::vector<FileImage> buildCorpus(Rng& rng, const std::u16string& folder) {
    std::vector<FileImage> files;
    files.push_back(whole("empty", {}));
    files.push_back(whole("one line", Bytes{'a', 'b', 'c', '\n'}));
    files.push_back(whole("lines", textLines(rng, 40)));
    const std::string unbroken = modifiedUtf8(plainText(rng, 5000));
    files.push_back(whole("text without line feed", Bytes(unbroken.begin(), unbroken.end())));
    files.push_back(whole("binary", randomBytes(rng, 3000)));
    const std::vector<uint8_t> text = testkit::sampleData(200000, true, 11);
    files.push_back(whole("large text", Bytes(text.begin(), text.end())));

    const Bytes good = container(textLines(rng, 20));
    for (size_t cut = 0; cut <= kHeader; ++cut) {
        files.push_back(
            damaged("truncated at " + std::to_string(cut), Bytes(good.begin(), good.begin() + cut)));
    }
    for (size_t cut : {kHeader + 1, kHeader + 5, good.size() / 2, good.size() - 1}) {
        files.push_back(
            damaged("body cut at " + std::to_string(cut), Bytes(good.begin(), good.begin() + cut)));
    }
    for (int i = 0; i < 6; ++i) {
        files.push_back(damaged("random bytes", randomBytes(rng, rng.range(0, 64))));
    }
    Bytes magicOnly = randomBytes(rng, 40);
    std::memcpy(magicOnly.data(), "VZL\x1a", 4);
    files.push_back(damaged("magic and random bytes", magicOnly));
    const uint32_t impossible[][2] = {{0xFFFFFFFFu, 0xFFFFFFFFu}, {0, 0xFFFFFFFFu}, {0xFFFFFFFFu, 0},
                                      {0x7FFFFFFFu, 10},          {0, 0},           {1, 1}};
    for (const auto& counts : impossible) {
        Bytes b = good;
        putLe32(b, 8, counts[0]);
        putLe32(b, 12, counts[1]);
        files.push_back(damaged("counts " + std::to_string(counts[0]) + "/" + std::to_string(counts[1]), b));
    }
    for (const char* version : {"01", "0", "", "000", "0000", "ab"}) {
        Bytes b = good;
        std::memset(b.data() + 4, 0, 4);
        std::memcpy(b.data() + 4, version, std::strlen(version));
        files.push_back(damaged(std::string("version \"") + version + "\"", b));
    }
    Bytes flipped = good;
    for (int i = 0; i < 4; ++i) {
        flipped[kHeader + rng.below(static_cast<uint32_t>(good.size() - kHeader))] ^= 0x5A;
    }
    files.push_back(damaged("damaged body", flipped));
    Bytes trailing = good;
    trailing.insert(trailing.end(), {1, 2, 3});
    files.push_back(damaged("bytes after the body", trailing));

    for (size_t i = 0; i < files.size(); ++i) {
        const std::string name = "\\c" + std::to_string(i) + ".vz";
        files[i].path = folder + std::u16string(name.begin(), name.end());
        testkit::writeAll(std::wstring(files[i].path.begin(), files[i].path.end()), files[i].bytes);
    }
    FileImage dirImage;
    dirImage.label = "folder";
    dirImage.kind = FileImage::Folder;
    dirImage.path = folder;
    files.push_back(dirImage);
    FileImage missing;
    missing.label = "missing file";
    missing.kind = FileImage::Missing;
    missing.path = folder + u"\\no-such-file.vz";
    files.push_back(missing);
    missing.label = "file in a missing folder";
    missing.path = folder + u"\\no-such-folder\\x.vz";
    files.push_back(missing);
    return files;
}

}  // namespace fuzz
