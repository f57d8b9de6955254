// SPDX-License-Identifier: Apache-2.0
// Tells whether a text is a document package's JSON, as the answer to a read request holds it.
#pragma once

#include <string>
#include <string_view>

namespace host {

/// What was found in a text: a package, or why it is none.
struct PackageText {
    std::string_view json;  ///< The JSON object of the package, in the text that was looked at.
    std::string fault;      ///< Why there is no package, for people; empty when there is one.
    std::string refusal;    ///< Why it cannot be written, as far as can be seen; for people.
};

/// Looks for one JSON object with the arrays "parts" and "relationships" in `text`, with nothing
/// but white space around it. Linear in its length; takes the memory that its values need.
PackageText findPackage(std::string_view text);

}  // namespace host
