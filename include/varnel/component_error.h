// The error that unexpected failures travel as, from where they arise to the client.
#pragma once

#include <cstdint>
#include <exception>
#include <string>

#include "export.h"

namespace varnel {

// Error numbers the component raises itself; stable across releases.
namespace errc {
// An arithmetic result does not fit its 16- or 32-bit field.
inline constexpr std::int32_t overflow = 6;
// An index outside an array or a collection.
inline constexpr std::int32_t subscript_out_of_range = 9;
// An object (a document element, a meter model) that is not there.
inline constexpr std::int32_t missing_object = 91;
// A document operation that failed (malformed text, unreadable file).
inline constexpr std::int32_t document_failure = 440;
// The transport library or one of its functions could not be loaded.
inline constexpr std::int32_t transport_unavailable = 453;
// Anything else the component did not expect (a failed allocation, a library exception).
inline constexpr std::int32_t internal = 51;
}  // namespace errc

// An unexpected failure: a number and a description (at the client, the routine trace).
class VARNEL_API ComponentError : public std::exception {
public:
    ComponentError(std::int32_t number, std::string description, std::int32_t line = 0);

    std::int32_t number() const noexcept { return number_; }
    const std::string& description() const noexcept { return description_; }
    // Source location number where the error arose, 0 when unknown.
    std::int32_t line() const noexcept { return line_; }
    const char* what() const noexcept override { return description_.c_str(); }

private:
    std::int32_t number_;
    std::string description_;
    std::int32_t line_;
};

}  // namespace varnel
