#include "progress.h"

#include "kelvo.h"
#include "messages.h"

#include <algorithm>

namespace {

constexpr int BAR_WIDTH = 50;
constexpr char BAR[] = "##################################################";
static_assert(sizeof BAR == BAR_WIDTH + 1);

float prog_percent = -1.0F;  // as last drawn
uint32_t num_tf_openned = 0; // files counted so far

void draw(int iPercent, int iMarks) {
    output_err_text("\r%3d%%|%-*.*s|%8u/%u files processed... ", iPercent, BAR_WIDTH, iMarks, BAR,
                    num_tf_openned, total_tf_count);
}

} // namespace

int kelvo_progress_status() {
    if (!bShowProgress || total_tf_count == 0)
        return 0;
    const float percent =
        static_cast<float>(num_tf_openned * 100U) / static_cast<float>(total_tf_count);
    if (static_cast<int>(percent) > static_cast<int>(prog_percent)) {
        prog_percent = percent;
        const int iMarks = static_cast<int>(50.0 * static_cast<double>(percent)) / 100;
        draw(static_cast<int>(percent), std::min(iMarks, BAR_WIDTH));
    }
    ++num_tf_openned;
    return 0;
}
