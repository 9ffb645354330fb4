// Writes the seed corpus of zelbrin_container_fuzz into the folder given: Velzip files made by
// the container code itself (Zel_Compress::Compress), plus an empty file and a header alone.
// Run through `scripts/fuzz-native --make-seeds`; the output is committed in fuzz/corpus/zelbrin/.
#include "container_alone.h"

#include <cstdio>
#include <string>
#include <vector>

namespace {

using Bytes = std::vector<unsigned char>;

// Text lines, as VelzipFile writes them.
Bytes lines(size_t count) {
    std::string text;
    for (size_t i = 0; i < count; ++i) {
        text += "line " + std::to_string(i) + " of the sample\n";
    }
    return Bytes(text.begin(), text.end());
}

// One line over and over: much data from a small body.
Bytes sameLine(size_t size) {
    const std::string line = "the same line again\n";
    Bytes data(size);
    for (size_t i = 0; i < size; ++i) {
        data[i] = static_cast<unsigned char>(line[i % line.size()]);
    }
    return data;
}

// Bytes that hardly compress, from a fixed linear congruential sequence.
Bytes noise(size_t size) {
    Bytes data(size);
    uint32_t x = 12345;
    for (unsigned char& b : data) {
        x = x * 1103515245u + 12345u;
        b = static_cast<unsigned char>(x >> 24);
    }
    return data;
}

Bytes velzip(const Bytes& data, unsigned level, bool deflate) {
    Zel_Compress c;
    c.SetVersion(3, level);
    c.SetCompressFlags(deflate ? 1 : 0, 0);
    const auto size = static_cast<unsigned>(data.size());
    Bytes out(Zel_Compress::GetSizeofCompressedBuffer(size, 1, 1, 0));
    out.resize(c.Compress(out.data(), static_cast<unsigned>(out.size()), data.data(), size));
    return out;
}

bool save(const std::string& folder, const char* name, const Bytes& bytes) {
    const std::string path = folder + "/" + name;
    FILE* f = std::fopen(path.c_str(), "wb");
    const bool ok = f != nullptr && std::fwrite(bytes.data(), 1, bytes.size(), f) == bytes.size();
    if (f != nullptr && std::fclose(f) != 0) {
        return false;
    }
    return ok;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: make_zelbrin_seeds FOLDER\n");
        return 2;
    }
    const std::string folder = argv[1];
    const Bytes text = velzip(lines(200), 8, true);
    const struct {
        const char* name;
        Bytes bytes;
    } seeds[] = {
        {"empty-file", {}},
        {"header-only", Bytes(text.begin(), text.begin() + Zel::kHeaderBytes)},
        {"no-data", velzip({}, 6, true)},
        {"one-byte", velzip({'x'}, 6, true)},
        {"lines-200", text},
        {"stored-300", velzip(noise(300), 0, false)},
        {"noise-2000", velzip(noise(2000), 9, true)},
        // More than one 64 KiB piece of decoded data: a stream decodes it in several refills.
        {"same-line-100000", velzip(sameLine(100000), 6, true)},
    };
    for (const auto& seed : seeds) {
        if (!save(folder, seed.name, seed.bytes)) {
            std::fprintf(stderr, "make_zelbrin_seeds: cannot write %s/%s\n", folder.c_str(), seed.name);
            return 1;
        }
    }
    return 0;
}
