#include "reference_reader.h"

#include <algorithm>

namespace {

std::string check_header(const trace_record_header& header) {
    const unsigned function = header.function;
    if (header.length < sizeof(trace_record_header))
        return "length " + std::to_string(header.length);
    if (function > 17 && function != 19 && function < 0xFFFE)
        return "function " + std::to_string(function);
    const auto is_printable = [](char c) { return c >= 0x20 && c <= 0x7E; };
    if (function >= 1 && function <= 16 &&
        !std::all_of(std::begin(header.compId), std::end(header.compId), is_printable))
        return "compId";
    return {};
}

/// Checks that the counted elements are numbered in steps of 2. Held records
/// have no number yet.
std::string check_numbers(const std::vector<ring_element>& elements) {
    const ring_element* pLast = nullptr;
    for (const ring_element& element : elements) {
        if (!element.counts() || element.is_held())
            continue;
        if (pLast != nullptr && element.header.seqNumber != pLast->header.seqNumber + 2)
            return "number " + std::to_string(element.header.seqNumber) + " at " +
                   std::to_string(element.uAt) + " follows " +
                   std::to_string(pLast->header.seqNumber);
        pLast = &element;
    }
    return {};
}

} // namespace

std::vector<ring_element> ring_listing::records() const {
    std::vector<ring_element> result;
    std::copy_if(elements.begin(), elements.end(), std::back_inserter(result),
                 [](const ring_element& e) { return !e.is_filler() && !e.is_held(); });
    return result;
}

ring_listing list_ring(trace_bytes file) {
    const auto header = load<trace_file_header>(file, 0);
    const size_t uOldest = header.uOldestRecordOffset;
    if (header.uActualFileSize != file.size())
        return {{}, "uActualFileSize " + std::to_string(header.uActualFileSize)};
    if (uOldest < header.uOffset || !lies_inside(file, uOldest, sizeof(trace_record_header)))
        return {{}, "uOldestRecordOffset " + std::to_string(uOldest)};
    ring_listing ring;
    size_t uAt = uOldest;
    size_t uWalked = 0;
    do {
        ring_element element;
        element.uAt = static_cast<uint32_t>(uAt);
        element.header = load<trace_record_header>(file, uAt);
        ring.problem = check_header(element.header);
        if (ring.problem.empty() && !lies_inside(file, uAt, element.header.length))
            ring.problem = "end beyond the file";
        uWalked += element.header.length;
        if (ring.problem.empty() && uWalked > file.size() - header.uOffset)
            ring.problem = "once around without meeting uOldestRecordOffset";
        if (!ring.problem.empty()) {
            ring.problem += " at " + std::to_string(uAt);
            return ring;
        }
        const trace_bytes body = load_run(file, uAt + sizeof(trace_record_header),
                                          element.header.length - sizeof(trace_record_header));
        element.body.assign(body.begin(), body.end());
        uAt += element.header.length;
        if (uAt == file.size())
            uAt = header.uOffset;
        ring.elements.push_back(std::move(element));
    } while (uAt != uOldest);
    if (uWalked != file.size() - header.uOffset)
        ring.problem = "the ring leaves a part of the area out";
    else
        ring.problem = check_numbers(ring.elements);
    return ring;
}
