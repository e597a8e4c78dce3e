// The template files of the samples.
#pragma once

#include "options.h"

#include <span>
#include <string_view>

/// The trace ids that the templates of the story define. A name says what the
/// record is about, the template how it reads.
enum gateway_id : uint32_t {
    GWY_START = 0x00,
    GWY_LISTENING = 0x01,
    GWY_LIMITS = 0x02,
    GWY_REQUEST = 0x10,
    GWY_REQUEST_ID = 0x11,
    GWY_CLIENT = 0x12,
    GWY_STATUS = 0x13,
    GWY_ASK = 0x14,
    GWY_ANSWERED = 0x15,
    GWY_HEALTH = 0x18,
    GWY_OLDEST = 0x19,
    GWY_TOTALS = 0x1A,
    GWY_SKEW = 0x1B,
    GWY_REASON_CREATED = 0x20,
    GWY_REASON_LATER = 0x21,
    GWY_REASON_HEALTHY = 0x22,
};

enum order_id : uint32_t {
    ORD_START = 0x00,
    ORD_CONFIG = 0x02,
    ORD_PLACE = 0x10,
    ORD_CUSTOMER = 0x11,
    ORD_ITEM = 0x12,
    ORD_COMPLETE = 0x13,
    ORD_REFUSED = 0x14,
    ORD_RESERVE = 0x20,
    ORD_RESERVED = 0x21,
    ORD_STORE = 0x22,
    ORD_STORED = 0x23,
    ORD_NOT_STORED = 0x24,
    ORD_GIVE_BACK = 0x25,
};

enum storage_id : uint32_t {
    STO_START = 0x00,
    STO_SCRUB = 0x01,
    STO_SCRUB_DONE = 0x02,
    STO_READ = 0x10,
    STO_PAGE = 0x11,
    STO_FOUND = 0x12,
    STO_WRITE = 0x20,
    STO_JOURNAL = 0x21,
    STO_FILL = 0x22,
    STO_WRITTEN = 0x23,
    STO_FAILED = 0x24,
    STO_GROWN = 0x25,
    STO_TOTALS = 0x26,
    STO_ERROR = 0x30,
};

/// The trace ids of the other profiles' components.
enum plain_id : uint32_t { PLAIN_RECORD = 1 };

enum mixed_id : uint32_t {
    MIX_START = 0x00,
    MIX_ENTER = 0x01,
    MIX_LEAVE = 0x02,
    MIX_INT32 = 0x04,
    MIX_INT32_2 = 0x05,
    MIX_UINT32 = 0x06,
    MIX_UINT32_2 = 0x07,
    MIX_INT64 = 0x08,
    MIX_INT64_2 = 0x09,
    MIX_UINT64 = 0x0A,
    MIX_UINT64_2 = 0x0B,
    MIX_VALUES = 0x0C,
    MIX_VALUES64 = 0x0D,
    MIX_ERROR = 0x0E,
    MIX_STRINGS = 0x0F,
    MIX_DATA = 0x10,
    MIX_HANDLE = 0x11,
    MIX_UNKNOWN = 0xFF, ///< has no template: shows the form without one
};

/// One template file.
struct template_text {
    std::string_view compId;
    std::string_view text;
};

/// The template files that print the profile's records.
std::span<const template_text> templates_of(sample_profile profile);

/// Writes them as COMP.tpl into the directory, in place of files of that name.
/// Returns false when the message is printed.
bool write_templates(const std::string& directory, sample_profile profile);
