#include "live_support.h"

#include <algorithm>
#include <cstdio>
#include <ostream>
#include <sstream>

#include <gtest/gtest.h>

namespace {

bool parse_record(std::string_view sLine, live_record* pRecord) {
    if (sLine.starts_with('['))
        sLine.remove_prefix(std::min(sLine.find(']') + 1, sLine.size()));
    unsigned long long uNumber = 0;
    const bool bParsed = sscanf(std::string(sLine).c_str(), " 0x%8x %u %llu ", &pRecord->uSeqNumber,
                                &pRecord->uFile, &uNumber) == 3;
    pRecord->uNumber = uNumber;
    return bParsed;
}

bool is_summary(std::string_view sLine) {
    return sLine.starts_with('\t') || sLine.find("Filename: ") != sLine.npos;
}

} // namespace

command_setup live_writer_setup() {
    command_setup setup;
    setup.sProgram = KELVO_LIVE_WRITER;
    setup.timeoutSeconds = 600;
    return setup;
}

void PrintTo(const number_range& range, std::ostream* pOut) {
    *pOut << range.uFirst << ".." << range.uLast;
}

missing_numbers dropped_by(const command_result& writer) {
    EXPECT_EQ(writer.status, 0) << writer.sErr;
    missing_numbers dropped;
    std::istringstream lines(writer.sOut);
    std::string sWord;
    while (lines >> sWord) {
        unsigned int uFile = 0;
        number_range range{};
        if (sWord == "dropped" && lines >> uFile >> range.uFirst >> range.uLast)
            dropped[uFile].push_back(range);
    }
    return dropped;
}

std::optional<std::string_view> record_stream::next_line() {
    size_t uEnd;
    while ((uEnd = m_sText.find('\n', m_uAt)) == m_sText.npos) {
        m_sText.erase(0, m_uAt);
        m_uAt = 0;
        const std::string sMore = m_command.read_text();
        if (sMore.empty()) {
            EXPECT_EQ(m_sText, "") << "the text ends within a record";
            return {};
        }
        m_sText += sMore;
    }
    const std::string_view sLine = std::string_view(m_sText).substr(m_uAt, uEnd - m_uAt);
    m_uAt = uEnd + 1;
    return sLine;
}

void record_stream::check_order(const live_record& record) {
    uint64_t& uLast = m_last[record.uFile];
    if (uLast != 0 && record.uNumber > uLast + 1)
        m_missing[record.uFile].push_back({uLast + 1, record.uNumber - 1});
    if (record.uNumber <= uLast)
        ADD_FAILURE() << "file " << record.uFile << ": " << record.uNumber << " behind " << uLast;
    // Only the last record of a killed writer may be left without its number.
    if (m_lacksNumber.contains(record.uFile))
        ADD_FAILURE() << "file " << record.uFile << ": " << uLast
                      << " was taken before it had its sequence number";
    if (record.uSeqNumber % 2 != 0)
        m_lacksNumber.insert(record.uFile);
    uLast = record.uNumber;
}

std::optional<live_record> record_stream::next() {
    while (const auto line = next_line()) {
        live_record record;
        if (parse_record(*line, &record)) {
            ++m_uCount;
            check_order(record);
            return record;
        }
        if (m_uCount != 0 || !is_summary(*line))
            ADD_FAILURE() << "no record: " << *line;
    }
    return {};
}
