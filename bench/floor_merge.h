// Which of many traces comes next: a tree of losers, where a new time plays
// against one other per level on its way up, without a branch to guess.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

class floor_merge {
public:
    /// The times of the first records; UINT64_MAX is that of an ended trace.
    explicit floor_merge(std::span<const uint64_t> times)
        : uLeaves(std::bit_ceil(std::max<size_t>(times.size(), 1))), losers(uLeaves) {
        std::vector<player> winners(2 * uLeaves, player{UINT64_MAX, 0});
        for (size_t u = 0; u < times.size(); ++u)
            winners[uLeaves + u] = {times[u], u};
        for (size_t u = uLeaves - 1; u > 0; --u) {
            const player &left = winners[2 * u], &right = winners[2 * u + 1];
            const bool bRight = right.uTime < left.uTime;
            winners[u] = bRight ? right : left;
            losers[u] = bRight ? left : right;
        }
        winner = winners[1];
    }

    size_t first() const {
        return winner.uTrace;
    }
    uint64_t time() const {
        return winner.uTime;
    }

    /// Time of the first record of all other traces.
    uint64_t second_time() const {
        uint64_t uTime = UINT64_MAX;
        for (size_t u = (uLeaves + winner.uTrace) / 2; u > 0; u /= 2)
            uTime = std::min(uTime, losers[u].uTime);
        return uTime;
    }

    /// The first trace goes on at `uTime`.
    void replace_first(uint64_t uTime) {
        player up{uTime, winner.uTrace};
        for (size_t u = (uLeaves + up.uTrace) / 2; u > 0; u /= 2) {
            const player other = losers[u];
            const bool bOther = other.uTime < up.uTime;
            losers[u].uTime = bOther ? up.uTime : other.uTime;
            losers[u].uTrace = bOther ? up.uTrace : other.uTrace;
            up.uTime = bOther ? other.uTime : up.uTime;
            up.uTrace = bOther ? other.uTrace : up.uTrace;
        }
        winner = up;
    }

private:
    struct player {
        uint64_t uTime;
        size_t uTrace;
    };
    size_t uLeaves;
    std::vector<player> losers; ///< by node; the root is 1
    player winner;
};
