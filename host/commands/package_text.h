// SPDX-License-Identifier: Apache-2.0
// Whether a text is a document package's JSON, as in the answer to a read request.
#pragma once

#include <string>
#include <string_view>

namespace host {

/// The member with the names of the parts that were not printed as they are, since they are no
/// UTF-8; absent where there are none.
inline constexpr const char* brokenPartsKey = "brokenParts";

/// A package that was found in a text, or why there is none.
struct PackageText {
    std::string_view json;  ///< The JSON object of the package, within the text.
    std::string fault;      ///< Why there is no package, for people; empty when there is one.
    std::string refusal;    ///< Why it cannot be written as it is; for people, empty when it can.
};

/// Looks for one JSON object with the arrays "parts" and "relationships" in `text`, with nothing
/// but white space around it. Linear in its length; takes the memory that its values need.
PackageText findPackage(std::string_view text);

}  // namespace host
