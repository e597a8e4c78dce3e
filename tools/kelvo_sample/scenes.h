// What happens in a run of the service.
#pragma once

#include "service.h"

/// All three programs come up. The storage daemon has been busy for a while,
/// `iSegments` records long.
void play_opening(service& s, int iSegments);

/// An order that is taken; with `bProbe` a health check comes in between.
void play_order(service& s, bool bProbe);

/// An order that is refused since the storage daemon has no room for it.
void play_refusal(service& s);

/// A health check alone.
void play_health(service& s);

/// Everybody counts up what has been done.
void play_totals(service& s);
