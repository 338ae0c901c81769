/**
 * @file return_codes.h
 * The texts of the return codes, as the component writes them into status documents.
 */
#pragma once

#include <string>

#include "export.h"

namespace varnel {

/// The text of a ReturnValues_Enum code; "Unknown status" for a code without one.
VARNEL_API std::string returnCodeText(long long code);

}  // namespace varnel
