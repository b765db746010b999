#pragma once

// The description of a value that a message carries. Internal to logging.

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/String.h"

/// Returns `object.description()`, with "(null)" for null. If it throws, returns "(no description)": a value
/// that cannot be described must not keep the message from being written.
rt::String LUMLogDescriptionOf(const rt::Object& object);
