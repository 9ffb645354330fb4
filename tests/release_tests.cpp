// The shipped DLLs as Windows reads them: each carries a version resource with the version of
// the VERSION file, its own file name and the architecture it was built for, and that
// architecture is the one in its PE header.
#include <windows.h>

#include <gtest/gtest.h>

#include <cstring>
#include <fstream>
#include <string>
#include <vector>

namespace {

constexpr const char* kArch = sizeof(void*) == 8 ? "x64" : "x86";
constexpr const char* kBits = sizeof(void*) == 8 ? "64-bit Windows (x64)" : "32-bit Windows (x86)";

std::vector<char> versionBlock(const char* file) {
    DWORD ignored = 0;
    const DWORD size = GetFileVersionInfoSizeA(file, &ignored);
    std::vector<char> block(size);
    if (size == 0 || !GetFileVersionInfoA(file, 0, size, block.data())) {
        block.clear();
    }
    return block;
}

std::string stringValue(std::vector<char>& block, const char* name) {
    const std::string path = std::string("\\StringFileInfo\\040904B0\\") + name;
    void* value = nullptr;
    UINT length = 0;
    if (!VerQueryValueA(block.data(), path.c_str(), &value, &length) || length == 0) {
        return "<missing>";
    }
    return std::string(static_cast<const char*>(value), strnlen(static_cast<const char*>(value), length));
}

// "x86" or "x64" from the file's PE header, "?" for anything else.
std::string machineOf(const char* file) {
    std::ifstream in(file, std::ios::binary);
    IMAGE_DOS_HEADER dos{};
    in.read(reinterpret_cast<char*>(&dos), sizeof dos);
    DWORD signature = 0;
    IMAGE_FILE_HEADER header{};
    in.seekg(dos.e_lfanew);
    in.read(reinterpret_cast<char*>(&signature), sizeof signature);
    in.read(reinterpret_cast<char*>(&header), sizeof header);
    if (!in || signature != IMAGE_NT_SIGNATURE) {
        return "?";
    }
    return header.Machine == IMAGE_FILE_MACHINE_I386    ? "x86"
           : header.Machine == IMAGE_FILE_MACHINE_AMD64 ? "x64"
                                                        : "?";
}

TEST(VersionResource, EachShippedDllCarriesTheOneVersionItsNameAndItsArchitecture) {
    int major = 0, minor = 0, patch = 0;
    ASSERT_EQ(std::sscanf(TESSEL_VERSION, "%d.%d.%d", &major, &minor, &patch), 3);
    for (const char* file : {"libTessel_JNI.dll", "libZelbrin.dll"}) {
        std::vector<char> block = versionBlock(file);
        ASSERT_FALSE(block.empty()) << file << ": no version resource";
        VS_FIXEDFILEINFO* fixed = nullptr;
        UINT length = 0;
        ASSERT_TRUE(VerQueryValueA(block.data(), "\\", reinterpret_cast<void**>(&fixed), &length)) << file;
        EXPECT_EQ(fixed->dwSignature, 0xFEEF04BDu) << file;
        for (auto [ms, ls] : {std::pair{fixed->dwFileVersionMS, fixed->dwFileVersionLS},
                              std::pair{fixed->dwProductVersionMS, fixed->dwProductVersionLS}}) {
            EXPECT_EQ(ms, static_cast<DWORD>(major << 16 | minor)) << file;
            EXPECT_EQ(ls, static_cast<DWORD>(patch << 16)) << file;
        }
        EXPECT_EQ(fixed->dwFileType, static_cast<DWORD>(VFT_DLL)) << file;

        EXPECT_EQ(stringValue(block, "FileVersion"), TESSEL_VERSION) << file;
        EXPECT_EQ(stringValue(block, "ProductVersion"), TESSEL_VERSION) << file;
        EXPECT_EQ(stringValue(block, "OriginalFilename"), file);
        EXPECT_EQ(stringValue(block, "ProductName"), "libTessel_JNI") << file;
        EXPECT_EQ(stringValue(block, "Architecture"), kArch) << file;
        EXPECT_NE(stringValue(block, "FileDescription").find(kBits), std::string::npos)
            << file << ": " << stringValue(block, "FileDescription");
        EXPECT_EQ(machineOf(file), kArch) << file << ": the resource and the PE header disagree";
    }
}

}  // namespace
