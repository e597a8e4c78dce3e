#include "direct.h"

#include "sink.h"
#include "stdout_stream.h"

#include <algorithm>
#include <cstring>

namespace {

static_assert(LEADING_ROOM <= STDOUT_ROOM);

char* put_text_before(char* pOut, const format_piece& piece) {
    if (piece.uLength <= PADDED_TEXT) [[likely]]
        std::memcpy(pOut, piece.pText, PADDED_TEXT);
    else
        std::memcpy(pOut, piece.pText, piece.uLength);
    return pOut + piece.uLength;
}

} // namespace

char* put_before_digits(char* pOut, const format_piece& piece, bool bNegative, int iDigits) {
    const int iMissing = piece.uWidth - iDigits - bNegative;
    if (iMissing > 0 && !piece.bZeros)
        pOut = std::fill_n(pOut, iMissing, ' ');
    if (bNegative)
        *pOut++ = '-';
    if (iMissing > 0 && piece.bZeros)
        pOut = std::fill_n(pOut, iMissing, '0');
    return pOut;
}

size_t write_leading_numbers(const format_plan& plan, trace_bytes run, int bAddr64,
                             size_t* puUsed) {
    const bool bMode = bAddr64 != 0;
    const size_t uCount = plan.leading.uCount;
    *puUsed = 0;
    if (uCount == 0 || plan.leading.uEnd[bMode] > run.size())
        return 0;
    output_begin_text();
    char* pOut = stdout_begin_room(LEADING_ROOM);
    for (size_t uConv = 0; uConv < uCount; ++uConv) {
        const format_piece& piece = plan.pPieces[uConv];
        pOut = put_text_before(pOut, piece);
        pOut =
            put_direct(pOut, piece, load_integer(piece.uShape[bMode], run, piece.uOffset[bMode]));
    }
    stdout_end_room(pOut);
    *puUsed = plan.leading.bTakesRest ? run.size() : plan.leading.uEnd[bMode];
    return uCount + plan.leading.bTakesRest;
}
