// SPDX-License-Identifier: Apache-2.0
// The charset that a document says it is in.
#pragma once

#include <string>
#include <string_view>

namespace platform::i18n::detail {

/// The charset named in the first few thousand bytes of a document: by an HTML or CSS charset, an
/// XML declaration, or an editor's "coding:" or "fileencoding=" line. Empty when none is named. It
/// is only what the document says; whether the converters know the name is another matter.
std::string declaredCharset(std::string_view bytes);

}  // namespace platform::i18n::detail
