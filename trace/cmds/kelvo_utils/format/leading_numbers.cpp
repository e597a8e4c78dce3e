#include "leading_numbers.h"

#include "direct.h"
#include "packed_parms.h"
#include "sink.h"
#include "stdout_stream.h"

#include <algorithm>
#include <cstring>
#include <string_view>

namespace {

/// Room in the stream for the numbers of one format and the text before them.
constexpr size_t ROOM = 512;
static_assert(ROOM <= STDOUT_ROOM);

/// Bytes that the text before a number and the number are written with, at most.
size_t room_for(const format_piece& piece) {
    return std::max<size_t>(piece.uLength, PADDED_TEXT) + direct_room(piece);
}

/// Notes how and where the parameter lies. Returns the end of the last one.
size_t place_parm(format_piece& piece, parm_type_t type, bool bAddr64, size_t uEnd) {
    const packed_shape& shape = packed_shapes(bAddr64)[base_type(type)];
    const size_t uStart = align_parm(uEnd, shape);
    piece.uShape[bAddr64] = shape_of_integer(type, bAddr64);
    piece.uOffset[bAddr64] = static_cast<uint16_t>(uStart);
    return uStart + shape.uSize;
}

/// Whether the conversion and the text before it can be written in one go.
bool is_plain(const format_piece& piece, bool bFirst) {
    const std::string_view text(piece.pText, piece.uLength);
    return is_put_directly(piece) && piece.uDirect != DIRECT_CHAR && // could be a newline
           text.find('\n') == text.npos && !(bFirst && !text.empty() && is_marker(text.front()));
}

[[gnu::cold]] void find_leading_numbers(const format_entry& entry) {
    leading_numbers found{};
    found.bKnown = true;
    size_t uRoom = 0;
    for (; found.uCount < entry.numConvs; ++found.uCount) {
        settle_direct_writer(entry, found.uCount);
        format_piece& piece = entry.pPieces[found.uCount];
        uRoom += room_for(piece);
        if (uRoom > ROOM || !is_plain(piece, found.uCount == 0))
            break;
        for (const bool bAddr64 : {false, true})
            found.uEnd[bAddr64] = static_cast<uint16_t>(
                place_parm(piece, entry.pParmTypes[found.uCount], bAddr64, found.uEnd[bAddr64]));
    }
    const format_piece& next = entry.pPieces[found.uCount];
    found.bTakesRest = found.uCount != 0 && found.uCount < entry.numConvs &&
                       next.uDirect == DIRECT_NOTHING && next.uLength == 0;
    entry.leading = found;
}

char* put_text_before(char* pOut, const format_piece& piece) {
    if (piece.uLength <= PADDED_TEXT) [[likely]]
        std::memcpy(pOut, piece.pText, PADDED_TEXT);
    else
        std::memcpy(pOut, piece.pText, piece.uLength);
    return pOut + piece.uLength;
}

} // namespace

size_t write_leading_numbers(const format_entry& entry, trace_bytes run, int bAddr64,
                             size_t* puUsed) {
    if (!entry.leading.bKnown) [[unlikely]]
        find_leading_numbers(entry);
    const bool bMode = bAddr64 != 0;
    const size_t uCount = entry.leading.uCount;
    *puUsed = 0;
    if (uCount == 0 || entry.leading.uEnd[bMode] > run.size())
        return 0;
    output_begin_text();
    char* pOut = stdout_begin_room(ROOM);
    for (size_t uConv = 0; uConv < uCount; ++uConv) {
        const format_piece& piece = entry.pPieces[uConv];
        pOut = put_text_before(pOut, piece);
        const auto shape = static_cast<integer_shape>(piece.uShape[bMode]);
        pOut = put_direct(pOut, piece, load_integer(shape, run, piece.uOffset[bMode]));
    }
    stdout_end_room(pOut);
    *puUsed = entry.leading.bTakesRest ? run.size() : entry.leading.uEnd[bMode];
    return uCount + entry.leading.bTakesRest;
}
