#pragma once

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <system_error>

/// $TMPDIR or /tmp.
inline std::string temp_parent() {
    const char* const pTemp = getenv("TMPDIR");
    return pTemp != nullptr && *pTemp != '\0' ? pTemp : "/tmp";
}

/// A directory that goes with everything in it.
class temp_directory {
public:
    explicit temp_directory(const std::string& sParent = temp_parent())
        : sPath(sParent + "/kelvo-bench-XXXXXX") {
        if (mkdtemp(sPath.data()) == nullptr) {
            perror(sPath.c_str());
            exit(1);
        }
    }
    temp_directory(const temp_directory&) = delete;
    temp_directory& operator=(const temp_directory&) = delete;
    ~temp_directory() {
        std::error_code error;
        std::filesystem::remove_all(sPath, error);
    }
    const std::string& path() const {
        return sPath;
    }

private:
    std::string sPath;
};
