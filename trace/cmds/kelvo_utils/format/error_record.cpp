// Error records: an error that the traced program saw. The message text is
// built by the common utilities from an error block that points into the
// record copy.
//
// Those functions want strings that end with a NUL. A string of the record that
// has none runs to the record's end, so one NUL put behind the record ends all
// of them; the queue element leaves room for it.

#include "digits.h"
#include "format_text.h"
#include "insufficient.h"
#include "record_bodies.h"
#include "record_text.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <memory>
#include <new>
#include <string_view>

static_assert(QUEUE_ELEMENT_OVERHEAD > offsetof(trace_queue_element, header),
              "a byte follows the record copy in its block");

namespace {

/// Arguments that need no allocation.
constexpr size_t USUAL_ARGUMENTS = 32;

struct message_deleter {
    void operator()(char* pMessage) const {
        cu_rel_errmsg_1(pMessage);
    }
};
using message_text = std::unique_ptr<char, message_deleter>;

/// The texts of the record; null where absent.
struct error_texts {
    char* pFunction;
    char* pFile;
    char* pFfdcId;
    char* pCatalogue;
    char* pDefault;
};

/// The record copy, which may be written to.
char* record_start(const record_view& record) {
    return reinterpret_cast<char*>(record.pElement) + offsetof(trace_queue_element, header);
}

void end_last_string(const record_view& record) {
    if (!record.bytes.empty())
        record_start(record)[record.bytes.size()] = '\0';
}

/// The string at `uOffset` of the record; null when that is 0 or outside.
char* string_at(const record_view& record, uint64_t uOffset) {
    const bool bPresent = uOffset != 0 && uOffset < record.bytes.size();
    return bPresent ? record_start(record) + uOffset : nullptr;
}

/// The string whose offset stands at `uField`.
char* string_of_field(const record_view& record, size_t uField) {
    return string_at(record, load<uint32_t>(record.bytes, uField));
}

error_texts find_texts(const record_view& record) {
    end_last_string(record);
    return {
        .pFunction = string_of_field(record, offsetof(trace_record_error, funcNameOffset)),
        .pFile = string_of_field(record, offsetof(trace_record_error, fileNameOffset)),
        .pFfdcId = string_of_field(record, offsetof(trace_record_error, ffdcIdOffset)),
        .pCatalogue = string_of_field(record, offsetof(trace_record_error, msgCatNameOffset)),
        .pDefault = string_of_field(record, offsetof(trace_record_error, defMsgOffset)),
    };
}

/// How many arguments lie wholly inside the record.
size_t count_arguments(const record_view& record) {
    const auto uWritten = load<uint32_t>(record.bytes, offsetof(trace_record_error, argCount));
    const size_t uHeld =
        load_run(record.bytes, sizeof(trace_record_error)).size() / sizeof(cu_error_arg_t);
    return std::min<size_t>(uWritten, uHeld);
}

/// Copies the first `uCount` arguments to where they are aligned, with the
/// addresses of their strings in place of the offsets.
void load_arguments(const record_view& record, cu_error_arg_t* pArgs, size_t uCount) {
    static constexpr char emptyString[] = "";
    for (size_t i = 0; i < uCount; i++) {
        pArgs[i] = load<cu_error_arg_t>(record.bytes,
                                        sizeof(trace_record_error) + i * sizeof(cu_error_arg_t));
        if (pArgs[i].cu_arg_type == CU_ERROR_ARG_CHAR_STR) {
            const auto uOffset = static_cast<uint64_t>(pArgs[i].cu_arg_value.cu_arg_long_long);
            const char* pString = string_at(record, uOffset);
            pArgs[i].cu_arg_value.cu_arg_char_str = pString ? pString : emptyString;
        }
    }
}

/// The text of the error's message, or null when it has none.
message_text build_message(const record_view& record, const error_texts& texts) {
    std::array<cu_error_arg_t, USUAL_ARGUMENTS> usual;
    std::unique_ptr<cu_error_arg_t[]> pMany;
    cu_error_arg_t* pArgs = usual.data();
    size_t uCount = count_arguments(record);
    if (uCount > usual.size()) {
        pMany.reset(new (std::nothrow) cu_error_arg_t[uCount]);
        if (pMany) {
            pArgs = pMany.get();
        } else {
            warn_insufficient_resources(record.pFile->pName,
                                        static_cast<int64_t>(uCount * sizeof(cu_error_arg_t)));
            uCount = usual.size();
        }
    }
    load_arguments(record, pArgs, uCount);

    const trace_bytes bytes = record.bytes;
    const cu_error_t block = {
        .cu_error_id = load<int32_t>(bytes, offsetof(trace_record_error, errorId)),
        .cu_ffdc_id = texts.pFfdcId,
        .cu_msg_cat = texts.pCatalogue,
        .cu_msg_set = load<int32_t>(bytes, offsetof(trace_record_error, msgSetNumber)),
        .cu_msg_num = load<int32_t>(bytes, offsetof(trace_record_error, msgNumber)),
        .cu_msg_default = texts.pDefault,
        .cu_arg_cnt = static_cast<uint32_t>(uCount),
        .cu_args = pArgs,
    };
    char* pMessage = nullptr;
    cu_get_errmsg_1(&block, &pMessage);
    return message_text(pMessage);
}

/// The NUL of the string belongs to its bytes, which any conversion may read.
parm_ref string_parm(const char* pString) {
    const std::string_view string = pString ? pString : "";
    return make_parm_ref(std::as_bytes(std::span(string.data(), string.size() + 1)), string.size());
}

parm_ref int_parm(trace_bytes bytes, size_t uOffset) {
    return make_parm_ref(load_run(bytes, uOffset, sizeof(int32_t)), sizeof(int32_t));
}

void write_by_format(const format_entry* pFormatEntry, const record_view& record,
                     const error_texts& texts, const char* pMessage) {
    parm_list parms;
    parms.pParms[0] = int_parm(record.bytes, offsetof(trace_record_error, errorId));
    parms.pParms[1] = string_parm(texts.pFunction);
    parms.pParms[2] = int_parm(record.bytes, offsetof(trace_record_error, lineNumber));
    parms.pParms[3] = string_parm(texts.pFile);
    parms.pParms[4] = string_parm(pMessage);
    parms.pParms[5] = string_parm(texts.pFfdcId);
    parms.numParms = 6;
    format_parms(pFormatEntry, &parms, 0);
}

/// A text with what printf's "%s" and "%d" would write between its parts.
class error_text {
public:
    explicit error_text(text_run& out) : text(out) {}

    error_text& add(const char* pText) {
        text.add(pText ? pText : "");
        return *this;
    }
    error_text& add(int32_t iNumber) {
        char digits[DIGITS_ROOM];
        const char* pEnd = std::to_chars(digits, std::end(digits), iNumber).ptr;
        text.add({digits, static_cast<size_t>(pEnd - digits)});
        return *this;
    }

private:
    kept_text text;
};

/// The form without a format.
void write_plainly(const record_view& record, const error_texts& texts, const char* pMessage) {
    text_run out;
    add_trace_id(out, record.uTraceId);
    error_text(out)
        .add("Error ")
        .add(load<int32_t>(record.bytes, offsetof(trace_record_error, errorId)))
        .add(" was returned from \"")
        .add(texts.pFunction)
        .add("\" on line ")
        .add(load<int32_t>(record.bytes, offsetof(trace_record_error, lineNumber)))
        .add(" in file \"")
        .add(texts.pFile)
        .add("\".");
    out.add('\n');
    if (pMessage) {
        error_text(out).add("   Message=").add(pMessage);
        out.add('\n');
    }
    if (texts.pFfdcId) {
        error_text(out).add("   FFDCID=\"").add(texts.pFfdcId).add("\"");
        out.add('\n');
    }
}

} // namespace

int format_error(const format_entry* pFormatEntry, const record_view& record) {
    const error_texts texts = find_texts(record);
    const message_text pMessage = build_message(record, texts);
    if (pFormatEntry)
        write_by_format(pFormatEntry, record, texts, pMessage.get());
    else
        write_plainly(record, texts, pMessage.get());
    return 0;
}

void write_error(const record_view& record, const format_entry* pFormat) {
    format_error(pFormat, record);
}
