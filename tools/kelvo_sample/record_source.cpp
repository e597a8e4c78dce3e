#include "record_source.h"

#include "bodies.h"
#include "templates.h"

#include <charconv>

namespace {

constexpr std::string_view WORDS[] = {"amber ", "birch ",  "cedar ",  "delta ", "ember ",
                                      "fjord ", "garnet ", "harbor ", "iris ",  "juniper "};
constexpr std::string_view NODES[] = {"node-a", "node-b", "node-c", "node-d"};

/// mixed repeats these steps, each round on one thread.
enum mixed_step : unsigned {
    STEP_SPECIAL = 0, ///< five of them, in every 64th round
    STEP_ENTER = 5,
    STEP_VALUES = 6, ///< eight kinds, 4 to 11
    STEP_ENTER_DEEPER = 14,
    STEP_ARRAY,
    STEP_ARRAY64,
    STEP_STRING,
    STEP_STRINGS,
    STEP_LEAVE_DEEPER,
    STEP_DATA,
    STEP_ERROR,
    STEP_HANDLE,
    STEP_UNKNOWN,
    STEP_LEAVE,
    MIXED_STEPS,
};
constexpr uint64_t ROUNDS_TO_SPECIAL = 64;
/// More than the records of one round take without their texts of free length,
/// and how many have such a text.
constexpr uint64_t MIXED_ROUND_BYTES = MIXED_STEPS * 56 + 400;
constexpr uint64_t MIXED_TEXTS = 3;

constexpr uint32_t PLAIN_LENGTH = sizeof(trace_record_uint32);
constexpr uint32_t BLOCK = sizeof(trace_data);
/// Three numbers and the name of a node.
constexpr uint32_t NUMBERS_LENGTH = sizeof(trace_record_data) + 3 * (BLOCK + 4) + BLOCK + 8;

/// What block 2 of a data record holds.
struct page_state {
    uint32_t uPage;
    uint16_t uSlots;
    char cClass;
    char cPad;
    double load;
};
static_assert(sizeof(page_state) == 16);
/// A data record without the bytes of its last block.
constexpr uint32_t DATA_LENGTH =
    sizeof(trace_record_data) + (BLOCK + 4) + (BLOCK + 8) + (BLOCK + sizeof(page_state)) + BLOCK;

template <class T> trace_bytes bytes_of(const T& value) {
    return std::as_bytes(std::span(&value, 1));
}

/// The bytes of a text whose NUL stands behind it.
trace_bytes bytes_with_nul(std::string_view text) {
    return std::as_bytes(std::span(text.data(), text.size() + 1));
}

/// `size` less `used`, 0 at least.
size_t rest_of(size_t size, size_t used) {
    return size > used ? size - used : 0;
}

} // namespace

uint64_t profile_file_size(const sample_options& options, uint64_t uRecords) {
    uint64_t uLength = options.uRecordSize + 4;
    uint64_t uMore = uLength;
    if (options.profile == sample_profile::PLAIN)
        uLength = PLAIN_LENGTH;
    else if (options.profile == sample_profile::NUMBERS)
        uLength = NUMBERS_LENGTH;
    else if (options.profile == sample_profile::MIXED) {
        uMore = MIXED_ROUND_BYTES + MIXED_TEXTS * options.uRecordSize;
        uLength = uMore / MIXED_STEPS + 1;
    }
    if (uRecords > UINT32_MAX / uLength)
        return UINT64_MAX;
    return (sizeof(trace_file_header) + uRecords * uLength + uMore + 64) & ~uint64_t{3};
}

record_source::record_source(const sample_options& sampleOptions, uint32_t uIndex)
    : options(sampleOptions), append_one(&record_source::append_plain),
      uFirstThread(0x1000 + (uIndex << 8)), random(sampleOptions.uSeed * 0x10001 + uIndex) {
    switch (options.profile) {
    case sample_profile::NUMBERS:
        append_one = &record_source::append_numbers;
        break;
    case sample_profile::STRINGS:
        append_one = &record_source::append_strings;
        break;
    case sample_profile::DATA:
        append_one = &record_source::append_data;
        break;
    case sample_profile::MIXED:
        append_one = &record_source::append_mixed;
        break;
    default:
        break;
    }
    while (sWords.size() < 2 * size_t{options.uRecordSize})
        sWords += WORDS[random.below(std::size(WORDS))];
}

uint32_t record_source::thread_of(uint64_t uCall) const {
    return uFirstThread + static_cast<uint32_t>(uCall % options.uThreads);
}

/// The number that a record carries.
uint32_t record_source::number_of(uint64_t uNumber) {
    return options.bNumbered ? static_cast<uint32_t>(uNumber) : random.below(1'000'000'000);
}

std::string_view record_source::words(size_t uLength) {
    const auto uChoice = static_cast<uint32_t>(sWords.size() - uLength);
    return std::string_view(sWords).substr(random.below(uChoice), uLength);
}

trace_writer_status record_source::append_plain(sample_file& file, uint64_t uNumber,
                                                uint64_t uWallTime) {
    return file.writer.append_uint32(file.origin("_PLN", thread_of(uNumber), uWallTime),
                                     PLAIN_RECORD, number_of(uNumber));
}

trace_writer_status record_source::append_numbers(sample_file& file, uint64_t uNumber,
                                                  uint64_t uWallTime) {
    const uint32_t numbers[] = {number_of(uNumber), random.below(500), random.below(100'000)};
    const trace_bytes blocks[] = {bytes_of(numbers[0]), bytes_of(numbers[1]), bytes_of(numbers[2]),
                                  bytes_with_nul(NODES[numbers[1] % std::size(NODES)])};
    return file.writer.append_data(file.origin("_NUM", thread_of(uNumber), uWallTime), PLAIN_RECORD,
                                   blocks);
}

trace_writer_status record_source::append_strings(sample_file& file, uint64_t uNumber,
                                                  uint64_t uWallTime) {
    char digits[20];
    const char* const pEnd = std::to_chars(digits, std::end(digits), number_of(uNumber)).ptr;
    const std::string_view number(digits, pEnd);
    const size_t uUsed = sizeof(trace_record_strings) + number.size() + 2;
    const std::string_view strings[] = {number, words(rest_of(options.uRecordSize, uUsed))};
    return file.writer.append_strings(file.origin("_STR", thread_of(uNumber), uWallTime),
                                      PLAIN_RECORD, strings);
}

trace_writer_status record_source::append_data(sample_file& file, uint64_t uNumber,
                                               uint64_t uWallTime) {
    const uint32_t uValue = number_of(uNumber);
    const uint32_t uChoice = random.below(1 << 20);
    const page_state page{uChoice >> 4, static_cast<uint16_t>(uChoice & 0x3F),
                          static_cast<char>('A' + uChoice % 26), 0, uChoice / 1048576.0};
    const size_t uDump = rest_of(options.uRecordSize, DATA_LENGTH);
    const trace_bytes blocks[] = {bytes_of(uValue),
                                  bytes_with_nul(NODES[uChoice % std::size(NODES)]), bytes_of(page),
                                  std::as_bytes(std::span(words(uDump)))};
    return file.writer.append_data(file.origin("_DAT", thread_of(uNumber), uWallTime), PLAIN_RECORD,
                                   std::span(blocks).first(uDump != 0 ? 4 : 3));
}

// ------------------------------------------------------------------- mixed

trace_writer_status record_source::append_mixed(sample_file& file, uint64_t uNumber,
                                                uint64_t uWallTime) {
    const auto uStep = static_cast<unsigned>(uNumber % MIXED_STEPS);
    const uint64_t uRound = uNumber / MIXED_STEPS;
    const trace_origin origin = file.origin("_MIX", thread_of(uRound), uWallTime);
    trace_writer& writer = file.writer;
    const size_t uText = rest_of(options.uRecordSize, sizeof(trace_record_strings) + 16);
    const uint64_t longs[] = {random.next(), random.next() >> 20, uNumber};
    const uint32_t values[] = {random.below(100), random.below(10'000), random.below(1'000'000),
                               random.below(100)};
    const std::string_view strings[] = {"reference", words(uText)};
    const trace_bytes handle = std::as_bytes(std::span(longs)).first(20);

    if (uStep < STEP_ENTER)
        return append_special(file, uRound % ROUNDS_TO_SPECIAL == 0 ? uStep : STEP_ENTER, origin);
    if (uStep >= STEP_VALUES && uStep < STEP_ENTER_DEEPER)
        return append_value(file, uStep - STEP_VALUES + TRC_FUNC_INT32, origin);
    switch (uStep) {
    case STEP_ARRAY:
        return writer.append_values(origin, MIX_VALUES, values);
    case STEP_ARRAY64:
        return writer.append_values64(origin, MIX_VALUES64, longs);
    case STEP_STRING:
        return writer.append_string(origin, strings[1]);
    case STEP_STRINGS:
        return writer.append_strings(origin, MIX_STRINGS, strings);
    case STEP_DATA:
        return append_mixed_data(file, origin);
    case STEP_ERROR:
        return append_mixed_error(file, origin);
    case STEP_HANDLE:
        return writer.append_data(origin, MIX_HANDLE, std::span(&handle, 1));
    case STEP_UNKNOWN:
        return writer.append_values(origin, MIX_UNKNOWN, values);
    case STEP_LEAVE_DEEPER:
    case STEP_LEAVE:
        return writer.append_id(origin, MIX_LEAVE);
    default:
        return writer.append_id(origin, MIX_ENTER);
    }
}

/// The records that say something about the file; STEP_ENTER stands for none.
trace_writer_status record_source::append_special(sample_file& file, unsigned uStep,
                                                  const trace_origin& origin) {
    trace_origin internal = origin;
    internal.compId = TRC_COMP_INTERNAL;
    constexpr uint32_t PID = 4711;
    switch (uStep) {
    case 0:
        return file.writer.append_start(internal, 0, PID, file.base);
    case 1:
        return file.writer.append_restart(internal, 1, PID, file.base, "core dumped");
    case 2:
        return file.writer.append_time_calibration(internal, file.base);
    case 3:
        return file.writer.append_discarded(internal);
    case 4:
        return file.writer.append_start(origin, 0, PID, file.base);
    default:
        return file.writer.append_uint32(origin, MIX_UINT32, random.below(1000));
    }
}

/// A record of a kind from 4 to 11; the trace id is the kind.
trace_writer_status record_source::append_value(sample_file& file, unsigned uStep,
                                                const trace_origin& origin) {
    const uint64_t u1 = random.next();
    const uint64_t u2 = random.next();
    const auto i1 = static_cast<int32_t>(u1);
    const auto i2 = static_cast<int32_t>(u2);
    const auto id = static_cast<uint32_t>(uStep);
    trace_writer& writer = file.writer;
    switch (uStep) {
    case TRC_FUNC_INT32:
        return writer.append_int32(origin, id, i1);
    case TRC_FUNC_INT32_2:
        return writer.append_int32_2(origin, id, i1, i2);
    case TRC_FUNC_UINT32:
        return writer.append_uint32(origin, id, static_cast<uint32_t>(u1));
    case TRC_FUNC_UINT32_2:
        return writer.append_uint32_2(origin, id, static_cast<uint32_t>(u1),
                                      static_cast<uint32_t>(u2));
    case TRC_FUNC_INT64:
        return writer.append_int64(origin, id, static_cast<int64_t>(u1));
    case TRC_FUNC_INT64_2:
        return writer.append_int64_2(origin, id, static_cast<int64_t>(u1),
                                     static_cast<int64_t>(u2));
    case TRC_FUNC_UINT64:
        return writer.append_uint64(origin, id, u1);
    default:
        return writer.append_uint64_2(origin, id, u1, u2);
    }
}

/// Eight parameters of all sizes, a block with a text of its own, a dump.
trace_writer_status record_source::append_mixed_data(sample_file& file,
                                                     const trace_origin& origin) {
    const uint32_t uValue = random.below(1'000'000);
    const int64_t iLong = -int64_t{uValue};
    const auto iShort = static_cast<int16_t>(uValue);
    const char cLetter = static_cast<char>('a' + uValue % 26);
    const double d = uValue / 1024.0;
    const float f = static_cast<float>(uValue % 64) / 4;
    const uint64_t uPointer = options.uAddrBits == 64 ? 0x7F00'0000'0000 + uValue : uValue;
    // The low half of a long comes first, which is what a 32-bit program wrote.
    const size_t uLong = options.uAddrBits / 8;
    struct {
        int32_t iNumber;
        int16_t iSmall;
        char name[10];
    } packed{static_cast<int32_t>(uValue), iShort, "packed"};
    const size_t uDump = rest_of(options.uRecordSize, 160);
    const trace_bytes blocks[] = {bytes_of(uValue),
                                  bytes_of(iLong).first(uLong),
                                  bytes_of(iShort),
                                  bytes_of(cLetter),
                                  bytes_with_nul(NODES[uValue % std::size(NODES)]),
                                  bytes_of(d),
                                  bytes_of(f),
                                  bytes_of(uPointer).first(uLong),
                                  bytes_of(packed).first(13),
                                  std::as_bytes(std::span(words(uDump)))};
    return file.writer.append_data(origin, MIX_DATA, std::span(blocks).first(uDump != 0 ? 10 : 9));
}

trace_writer_status record_source::append_mixed_error(sample_file& file,
                                                      const trace_origin& origin) {
    cu_error_arg_t args[2] = {};
    args[0].cu_arg_type = CU_ERROR_ARG_CHAR_STR;
    args[0].cu_arg_value.cu_arg_char_str = NODES[random.below(std::size(NODES))].data();
    args[1].cu_arg_type = CU_ERROR_ARG_INT;
    args[1].cu_arg_value.cu_arg_int = static_cast<int32_t>(random.below(100));
    trace_error_content error;
    error.traceId = MIX_ERROR;
    error.errorId = 1 + random.below(130);
    error.lineNumber = 1 + random.below(2000);
    error.funcName = "connect_node";
    error.fileName = "node.c";
    error.ffdcId = "MIX-1";
    error.defMsg = "%s did not answer in %d seconds";
    error.args = args;
    return file.writer.append_error(origin, error);
}
