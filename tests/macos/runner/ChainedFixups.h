#pragma once

#include "Fixups.h"

/// Fixes the image up by its chains.
void followChains(const Image& image, const macho::DataCommand& where, const Resolve& resolve);
