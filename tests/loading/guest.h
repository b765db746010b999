#pragma once

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

/// What a library that is opened and closed again exports as "give": sets `gift` to an object that the
/// program keeps.
using Give = void(rt::Ref<rt::Object>& gift);
