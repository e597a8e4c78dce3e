// A directory of its own for one test, removed with all it holds.
#pragma once

#include <string>
#include <string_view>

class temp_dir {
public:
    /// Makes the directory under $TMPDIR; ends the test program if it cannot.
    temp_dir();
    ~temp_dir();
    temp_dir(const temp_dir&) = delete;
    temp_dir& operator=(const temp_dir&) = delete;

    const std::string& path() const {
        return directory;
    }

    /// Path of a file in the directory; nothing is made.
    std::string file(std::string_view name) const;

private:
    std::string directory;
};
