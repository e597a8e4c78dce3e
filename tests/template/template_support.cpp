#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace {

int allocationsLeft = -1; // below 0: without limit

bool allocation_fails() {
    return allocationsLeft == 0 || (allocationsLeft > 0 && allocationsLeft-- == 0);
}

std::string type_name(parm_type_t type) {
    static const char* const names[] = {"?",     "CHAR",   "SHORT",   "INT",    "LONG",
                                        "LLONG", "DOUBLE", "LDOUBLE", "STRING", "HANDLE",
                                        "FLOAT", "REST",   "TRACEID"};
    const size_t uBase = type & PARM_BASE_MASK;
    return (type & PARM_UNSIGNED ? "U" : "") +
           std::string(uBase < std::size(names) ? names[uBase] : "?");
}

} // namespace

extern "C" {
void* __real_malloc(size_t size);
void* __real_calloc(size_t count, size_t size);
void* __real_realloc(void* pBlock, size_t size);

void* __wrap_malloc(size_t size) {
    return allocation_fails() ? nullptr : __real_malloc(size);
}
void* __wrap_calloc(size_t count, size_t size) {
    return allocation_fails() ? nullptr : __real_calloc(count, size);
}
void* __wrap_realloc(void* pBlock, size_t size) {
    return allocation_fails() ? nullptr : __real_realloc(pBlock, size);
}
}

allocation_limit::allocation_limit(int count) {
    allocationsLeft = count;
}

allocation_limit::~allocation_limit() {
    allocationsLeft = -1;
}

std::string dump_format(const format_entry& entry) {
    std::ostringstream out;
    out << (entry.properties == FORMAT_NUMBERED_PARMS ? "num [" : "seq [");
    for (int i = 0; i < entry.numParms; ++i)
        out << (i ? " " : "") << type_name(entry.pParmTypes[i]);
    out << ']';
    for (int i = 0; i < entry.numConvs; ++i) {
        const conv_spec& conv = entry.pConvSpecs[i];
        out << ' ' << conv.offset << '+' << +conv.lenConv << ':' << +conv.parmNum;
        if (conv.widthOffset || conv.widthParmNum != 255)
            out << " w" << +conv.widthOffset << ':' << +conv.widthParmNum;
        if (conv.precOffset || conv.precParmNum != 255)
            out << " p" << +conv.precOffset << ':' << +conv.precParmNum;
    }
    return out.str();
}

std::string dump_template(const template_file& file) {
    std::vector<const format_entry*> entries;
    for (const format_entry* pEntry = file.pFormats; pEntry; pEntry = pEntry->pNext)
        entries.insert(entries.begin(), pEntry);
    std::ostringstream out;
    for (const format_entry* pEntry : entries) {
        out << (pEntry == entries.front() ? "" : " ") << pEntry->trace_id;
        if (pEntry->block_id != -1)
            out << '/' << pEntry->block_id;
        out << ':' << pEntry->pString;
    }
    return out.str();
}

std::vector<std::string> messages_of(const std::function<void()>& action) {
    testing::internal::CaptureStderr();
    action();
    std::istringstream captured(testing::internal::GetCapturedStderr());
    std::vector<std::string> messages;
    for (std::string line; std::getline(captured, line);) {
        if (line.starts_with("kelvo: "))
            messages.push_back(line.substr(7));
        else if (!line.empty())
            messages.push_back("not a message: " + line);
    }
    return messages;
}

std::string joined_messages_of(const std::function<void()>& action) {
    std::string text;
    for (const std::string& message : messages_of(action))
        text += (text.empty() ? "" : " | ") + message;
    return text;
}

work_directory::work_directory() : before(std::filesystem::current_path()) {
    std::filesystem::current_path(temporary.path());
    directory = std::filesystem::current_path();
}

work_directory::~work_directory() {
    std::filesystem::current_path(before);
}

void work_directory::write(const std::string& file, std::string_view text) const {
    const std::filesystem::path path = std::filesystem::path(directory) / file;
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << text;
}
