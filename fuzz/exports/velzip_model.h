// The fuzz driver's model of the Velzip file state: which file is open in which direction,
// what has been read or written through it, and the failure record that getErrorIdN and
// getErrorMsgN must give back. Each operation of the family is predicted from it and checked.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "fuzz_run.h"

namespace fuzz {

struct VelzipModel {
    enum Mode { None, Reading, Writing };
    Mode mode = None;

    // The failure record. For ids 12 and 13 the number in the message is errorNumber, or any
    // number when it is -1 (a damaged file's own error).
    int errorId = 0;
    std::u16string errorMsg;
    int errorNumber = 0;

    // Reading: the file, how far it has been read, and the error that broke the stream
    // (-1 while a damaged file may break it at any read).
    FileImage reading;
    size_t position = 0;
    int readBroken = 0;

    // Writing: the path, the bytes written, and the error that broke the stream.
    std::u16string writePath;
    Bytes written;
    int writeBroken = 0;

    // Files written and closed in this case, as later reads will find them.
    std::vector<FileImage> writtenFiles;

    void record(int id, const std::u16string& message, int number = 0) {
        errorId = id;
        errorMsg = message;
        errorNumber = number;
    }
};

// The messages of the family, with the path or number where they have one.
std::u16string velzipMessage(int id, const std::u16string& path = u"", int number = 0);

// Header fields of a Velzip header held in bytes (at least 16).
bool hasMagic(const uint8_t* header);
uint32_t le32(const uint8_t* bytes);
// The version text of a header: its 4 bytes up to the first NUL.
std::string versionText(const uint8_t* header);

}  // namespace fuzz
