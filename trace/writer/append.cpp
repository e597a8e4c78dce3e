// The bodies that are more than a row of fields. They are written straight into
// their place in the ring.
#include "trace_writer.h"

#include <algorithm>
#include <cstring>

namespace {

constexpr std::byte NUL[1]{};

std::string_view up_to_nul(std::string_view text) {
    return text.substr(0, text.find('\0'));
}

/// Writes one value after the other; the place was measured before.
class body_writer {
public:
    explicit body_writer(std::byte* pBody) : pNext(pBody) {}

    template <class T> void put(const T& value) {
        std::memcpy(pNext, &value, sizeof(value));
        pNext += sizeof(value);
    }

    void put_bytes(trace_bytes bytes) {
        if (!bytes.empty())
            std::memcpy(pNext, bytes.data(), bytes.size());
        pNext += bytes.size();
    }

    /// Up to its first NUL, and a NUL.
    void put_text(std::string_view text) {
        put_bytes(std::as_bytes(std::span(up_to_nul(text))));
        put('\0');
    }

    void put_padding(size_t uSize) {
        pNext = std::fill_n(pNext, uSize, std::byte{0});
    }

private:
    std::byte* pNext;
};

size_t size_with_nul(std::string_view text) {
    return up_to_nul(text).size() + 1;
}

size_t padding_of(size_t uSize) {
    return (4 - uSize % 4) % 4;
}

/// The string of an argument; none for other types and for a null string.
std::string_view text_of(const cu_error_arg_t& arg) {
    if (arg.cu_arg_type != CU_ERROR_ARG_CHAR_STR || arg.cu_arg_value.cu_arg_char_str == nullptr)
        return {};
    return arg.cu_arg_value.cu_arg_char_str;
}

/// The head of an error record and its arguments as they are stored, and where
/// its strings go, one behind the other.
class error_layout {
public:
    explicit error_layout(const trace_error_content& error)
        : uEnd(sizeof(trace_record_error) + error.args.size() * sizeof(cu_error_arg_t)) {}

    /// Offset of the text in the record; 0 when it is absent.
    uint32_t add(std::string_view text) {
        if (text.data() == nullptr)
            return 0;
        const size_t uAt = uEnd;
        uEnd += size_with_nul(text);
        return static_cast<uint32_t>(uAt);
    }

    size_t body_size() const {
        return uEnd - sizeof(trace_record_header);
    }

private:
    size_t uEnd;
};

std::string_view present(std::string_view text) {
    return text.data() != nullptr ? text : std::string_view("");
}

/// Fills a head whose strings lie as `pLayout` says.
trace_record_error error_head(const trace_error_content& error, error_layout* pLayout) {
    trace_record_error head{};
    head.traceId = error.traceId;
    head.errorId = error.errorId;
    head.lineNumber = error.lineNumber;
    head.funcNameOffset = pLayout->add(present(error.funcName));
    head.fileNameOffset = pLayout->add(present(error.fileName));
    head.ffdcIdOffset = pLayout->add(error.ffdcId);
    head.msgSetNumber = error.msgSetNumber;
    head.msgNumber = error.msgNumber;
    head.msgCatNameOffset = pLayout->add(error.msgCatName);
    head.defMsgOffset = pLayout->add(error.defMsg);
    head.argCount = static_cast<uint32_t>(error.args.size());
    return head;
}

} // namespace

/// Fills the body in its place in the ring.
template <class FILL>
trace_writer_status trace_writer::append_filled(uint16_t function, const trace_origin& origin,
                                                size_t bodySize, const FILL& fill) {
    std::byte* pBody = nullptr;
    const trace_writer_status status = begin(function, origin, bodySize, &pBody);
    if (status != TRACE_WRITER_OK)
        return status;
    body_writer writer(pBody);
    fill(writer);
    return commit();
}

trace_writer_status trace_writer::append(uint16_t function, const trace_origin& origin,
                                         trace_bytes body) {
    return append(function, origin, {body});
}

trace_writer_status trace_writer::append(uint16_t function, const trace_origin& origin,
                                         std::initializer_list<trace_bytes> parts) {
    size_t uBody = 0;
    for (const trace_bytes part : parts)
        uBody += part.size();
    return append_filled(function, origin, uBody, [&](body_writer& writer) {
        for (const trace_bytes part : parts)
            writer.put_bytes(part);
    });
}

trace_writer_status trace_writer::append_string(const trace_origin& origin, std::string_view text) {
    return append(TRC_FUNC_STRING, origin, {std::as_bytes(std::span(up_to_nul(text))), NUL});
}

trace_writer_status trace_writer::append_restart(const trace_origin& origin, uint32_t traceId,
                                                 uint32_t pid, const cu_timeinfo& timeInfo,
                                                 std::string_view text) {
    const trace_record_start head{{}, traceId, pid, timeInfo};
    return append(TRC_FUNC_RESTART, origin,
                  {trace_body_of(head), std::as_bytes(std::span(up_to_nul(text))), NUL});
}

trace_writer_status trace_writer::append_data(const trace_origin& origin, uint32_t traceId,
                                              std::span<const trace_bytes> blocks) {
    const trace_record_data head{{}, traceId, static_cast<uint32_t>(blocks.size())};
    size_t uBody = trace_body_of(head).size();
    for (const trace_bytes block : blocks)
        uBody += sizeof(trace_data) + block.size() + padding_of(block.size());
    return append_filled(TRC_FUNC_DATA, origin, uBody, [&](body_writer& writer) {
        writer.put_bytes(trace_body_of(head));
        for (const trace_bytes block : blocks) {
            writer.put(static_cast<uint32_t>(block.size()));
            writer.put_bytes(block);
            writer.put_padding(padding_of(block.size()));
        }
    });
}

trace_writer_status trace_writer::append_values(const trace_origin& origin, uint32_t traceId,
                                                std::span<const uint32_t> values) {
    const trace_record_values head{{}, traceId, static_cast<uint32_t>(values.size())};
    return append(TRC_FUNC_VALUES, origin, {trace_body_of(head), std::as_bytes(values)});
}

trace_writer_status trace_writer::append_values64(const trace_origin& origin, uint32_t traceId,
                                                  std::span<const uint64_t> values) {
    const trace_record_values head{{}, traceId, static_cast<uint32_t>(values.size())};
    return append(TRC_FUNC_VALUES64, origin, {trace_body_of(head), std::as_bytes(values)});
}

trace_writer_status trace_writer::append_strings(const trace_origin& origin, uint32_t traceId,
                                                 std::span<const std::string_view> strings) {
    size_t uText = 0;
    for (const std::string_view text : strings)
        uText += size_with_nul(text);
    const trace_record_strings head{
        {}, traceId, static_cast<uint32_t>(strings.size()), static_cast<uint32_t>(uText)};
    const size_t uBody = trace_body_of(head).size() + uText;
    return append_filled(TRC_FUNC_STRINGS, origin, uBody, [&](body_writer& writer) {
        writer.put_bytes(trace_body_of(head));
        for (const std::string_view text : strings)
            writer.put_text(text);
    });
}

trace_writer_status trace_writer::append_error(const trace_origin& origin,
                                               const trace_error_content& error) {
    error_layout layout(error);
    const trace_record_error head = error_head(error, &layout);
    error_layout argLayout = layout; // continues behind the head's strings
    for (const cu_error_arg_t& arg : error.args)
        argLayout.add(text_of(arg));
    return append_filled(TRC_FUNC_ERROR, origin, argLayout.body_size(), [&](body_writer& writer) {
        writer.put_bytes(trace_body_of(head));
        for (cu_error_arg_t arg : error.args) {
            if (arg.cu_arg_type == CU_ERROR_ARG_CHAR_STR)
                arg.cu_arg_value.cu_arg_long = layout.add(text_of(arg));
            writer.put(arg);
        }
        for (const std::string_view text : {present(error.funcName), present(error.fileName),
                                            error.ffdcId, error.msgCatName, error.defMsg})
            if (text.data() != nullptr)
                writer.put_text(text);
        for (const cu_error_arg_t& arg : error.args)
            if (const std::string_view text = text_of(arg); text.data() != nullptr)
                writer.put_text(text);
    });
}
