// The records of one file of a profile. No record costs an allocation.
#pragma once

#include "sample_file.h"

#include <array>
#include <string>

class record_source {
public:
    /// `uIndex` is the number of the file, which has contents of its own.
    record_source(const sample_options& options, uint32_t uIndex);

    /// Appends record number `uNumber`, counted from 0. False when it was refused.
    bool append(sample_file& file, uint64_t uNumber, uint64_t uWallTime) {
        return file.note((this->*append_one)(file, uNumber, uWallTime));
    }

private:
    using append_function = trace_writer_status (record_source::*)(sample_file&, uint64_t,
                                                                   uint64_t);

    trace_writer_status append_plain(sample_file& file, uint64_t uNumber, uint64_t uWallTime);
    trace_writer_status append_numbers(sample_file& file, uint64_t uNumber, uint64_t uWallTime);
    trace_writer_status append_strings(sample_file& file, uint64_t uNumber, uint64_t uWallTime);
    trace_writer_status append_data(sample_file& file, uint64_t uNumber, uint64_t uWallTime);
    trace_writer_status append_mixed(sample_file& file, uint64_t uNumber, uint64_t uWallTime);

    // Kinds of append_mixed.
    trace_writer_status append_special(sample_file& file, unsigned uStep,
                                       const trace_origin& origin);
    trace_writer_status append_value(sample_file& file, unsigned uStep, const trace_origin& origin);
    trace_writer_status append_mixed_data(sample_file& file, const trace_origin& origin);
    trace_writer_status append_mixed_error(sample_file& file, const trace_origin& origin);

    uint32_t thread_of(uint64_t uCall) const;
    uint32_t number_of(uint64_t uNumber);
    std::string_view words(size_t uLength);

    const sample_options& options;
    append_function append_one;
    uint32_t uFirstThread;
    random_numbers random;
    std::string sWords; ///< twice the length of the longest text taken from it
};

/// Bytes that the file needs so that all of `uRecords` fit.
uint64_t profile_file_size(const sample_options& options, uint64_t uRecords);
