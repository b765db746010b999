#pragma once

#include "Fixups.h"

/// Fixes the image up by its programs of opcodes: those that add the image's slide, and those that bind
/// names.
void obeyOpcodes(const Image& image, const macho::FixupOpcodesCommand& where, const Resolve& resolve);
