// A scratch folder right under C:\ with empty subfolders and files, removed afterwards. The
// folder browser's tree reaches it in a few clicks (My Computer, C:, the folder), where the
// Windows temp folder lies below folders the tree may not show; file dialogs take it as
// their start folder.
#pragma once

#include <windows.h>

#include <string>
#include <utility>
#include <vector>

namespace testkit {

class CDriveFolder {
public:
    // C:\<prefix>-<process id>, so test programs running side by side do not collide.
    CDriveFolder(const std::string& prefix, std::vector<std::string> folders, std::vector<std::string> files)
        : path_("C:\\" + prefix + "-" + std::to_string(GetCurrentProcessId())),
          folders_(std::move(folders)),
          files_(std::move(files)) {
        CreateDirectoryA(path_.c_str(), nullptr);
        for (const std::string& name : folders_) {
            CreateDirectoryA(child(name).c_str(), nullptr);
        }
        for (const std::string& name : files_) {
            CloseHandle(
                CreateFileA(child(name).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr));
        }
    }
    ~CDriveFolder() {
        // A file dialog leaves the process in the folder it showed last, and Windows does not
        // remove the current folder.
        SetCurrentDirectoryA("C:\\");
        for (const std::string& name : files_) {
            DeleteFileA(child(name).c_str());
        }
        for (const std::string& name : folders_) {
            RemoveDirectoryA(child(name).c_str());
        }
        RemoveDirectoryA(path_.c_str());
    }
    CDriveFolder(const CDriveFolder&) = delete;
    CDriveFolder& operator=(const CDriveFolder&) = delete;

    const std::string& path() const { return path_; }
    std::string child(const std::string& name) const { return path_ + "\\" + name; }

private:
    std::string path_;
    std::vector<std::string> folders_, files_;
};

}  // namespace testkit
