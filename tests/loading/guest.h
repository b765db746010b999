#pragma once

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

/// The function "give" that a guest library exports. It sets `gift` to an object that the program keeps after
/// closing the library.
using Give = void(rt::Ref<rt::Object>& gift);
