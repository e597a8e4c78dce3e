// The text of each record of a file in memory, for comparison with that of the
// file before it was damaged.
#pragma once

#include "hostile_harness.h"

#include <string>
#include <vector>

struct written_record {
    uint32_t uOffset = 0; ///< in the file
    uint32_t uLength = 0; ///< as far as it lies in the file
    std::string text{};

    friend bool operator==(const written_record&, const written_record&) = default;
};

struct written_file {
    hostile_result result;
    std::vector<written_record> records;
};

/// Reads the file and writes each record in one form.
written_file write_records_of(trace_bytes file, uint8_t uForm = FORM_TEMPLATE);
