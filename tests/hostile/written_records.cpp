#include "written_records.h"

#include "stdout_stream.h"

#include <sys/mman.h>
#include <unistd.h>

namespace {

/// What was written to the file in memory since the last call.
std::string take_text(int fd) {
    stdout_flush();
    const off_t size = lseek(fd, 0, SEEK_CUR);
    std::string text(static_cast<size_t>(size), '\0');
    const ssize_t iRead = pread(fd, text.data(), text.size(), 0);
    hostile_check(iRead == size && ftruncate(fd, 0) == 0 && lseek(fd, 0, SEEK_SET) == 0,
                  "output can be read back");
    return text;
}

} // namespace

written_file write_records_of(trace_bytes file, uint8_t uForm) {
    static const int fdText = memfd_create("output", MFD_CLOEXEC);
    hostile_check(fdText >= 0, "a file in memory can be made");
    written_file written;
    hostile_options options;
    options.uForms = uForm;
    options.onWritten = [&written](const trace_queue_element& element) {
        written.records.push_back({element.offset, element.header.length, take_text(fdText)});
    };
    const redirected_output redirected(fdText);
    written.result = read_hostile_file(file, options);
    return written;
}
