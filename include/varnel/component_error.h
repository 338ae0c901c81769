/**
 * @file component_error.h
 * The error that unexpected failures travel as, from where they arise to the client.
 */
#pragma once

#include <cstdint>
#include <exception>
#include <string>

#include "export.h"

namespace varnel {

/// Error numbers the component raises itself; stable across releases.
namespace errc {
/// An arithmetic result does not fit its 16- or 32-bit field.
inline constexpr std::int32_t overflow = 6;
/// An index outside an array or a collection.
inline constexpr std::int32_t subscript_out_of_range = 9;
/// An object (a document element, a meter model) that is not there.
inline constexpr std::int32_t missing_object = 91;
/// A document operation that failed (malformed text, unreadable file).
inline constexpr std::int32_t document_failure = 440;
/// The transport library or one of its functions could not be loaded.
inline constexpr std::int32_t transport_unavailable = 453;
/// Anything else the component did not expect (a failed allocation, a library exception).
inline constexpr std::int32_t internal = 51;
}  // namespace errc

/**
 * An unexpected failure: a number (one of varnel::errc) and a description.
 *
 * A request that fails unexpectedly throws it to the client after writing it
 * into the status document; its description is then the trace of the
 * component's routines the failure passed through, from the request inwards, for
 * example "getReadings --> Fastmeterupload --> ".
 */
class VARNEL_API ComponentError : public std::exception {
public:
    /// An error with that number (varnel::errc) and description, arisen at source location `line` (0: unknown).
    ComponentError(std::int32_t number, std::string description, std::int32_t line = 0);

    /// The error number, one of varnel::errc.
    std::int32_t number() const noexcept { return number_; }
    /// What went wrong; at the client, the routine trace.
    const std::string& description() const noexcept { return description_; }
    /// Source location number where the error arose, 0 when unknown.
    std::int32_t line() const noexcept { return line_; }
    /// The description.
    const char* what() const noexcept override { return description_.c_str(); }

private:
    std::int32_t number_;
    std::string description_;
    std::int32_t line_;
};

}  // namespace varnel
