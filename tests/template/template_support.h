// What the tests of the templates share: text forms of what was compiled and
// parsed, captured messages, a directory to work in, failing allocations.
#pragma once

#include "temp_dir.h"
#include "template_file.h"

#include <functional>
#include <string>
#include <string_view>
#include <vector>

/// One line for a compiled format: the numbering, the parameter types, then per
/// conversion position+length:parameter, with the place and the parameter of a
/// '*' width (w) and precision (p): "seq [DOUBLE INT INT] 0+5:0 w1:1 p3:2".
std::string dump_format(const format_entry& entry);

/// The entries of a template, oldest first, each as "id:text" or
/// "id/block:text", one blank between them.
std::string dump_template(const template_file& file);

/// The messages that `action` writes to standard error, without the program
/// name and the newlines.
std::vector<std::string> messages_of(const std::function<void()>& action);

/// The same, joined by " | ".
std::string joined_messages_of(const std::function<void()>& action);

/// Lets the next `count` allocations of the templates succeed and all that follow fail, until
/// it goes out of scope.
struct allocation_limit {
    explicit allocation_limit(int count);
    ~allocation_limit();
};

/// A temporary directory that is the current one until its end.
class work_directory {
public:
    work_directory();
    ~work_directory();

    /// Absolute, without symbolic links.
    const std::string& name() const {
        return directory;
    }

    /// Writes a file under the directory, making the directories of its name.
    void write(const std::string& file, std::string_view text) const;

private:
    temp_dir temporary;
    std::string before;
    std::string directory;
};
