// Damage to a complete trace file, as crashes, full disks and faulty programs
// leave it behind.
#pragma once

#include "options.h"

#include <string>

/// Damages the file `path`, whose ring is sound and holds records. False, with a
/// message, when it cannot be read or written.
bool damage_file(const std::string& path, sample_damage damage);
