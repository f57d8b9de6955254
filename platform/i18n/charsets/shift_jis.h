// SPDX-License-Identifier: Apache-2.0
// Shift_JIS: everything that is special about it.
//
//  - The name means ICU's ibm-943_P15A-2003, which has the extensions of NEC and IBM.
//  - Bytes 1A, 1C and 7F: that table permutes them, as many of IBM's tables do. This is undone,
//    so that each decodes to the control code of its own number (ControlCodes in
//    icu_charset.cpp, for every such table), and is encoded as it was.
//  - When a file is read, U+001C becomes U+001A, the end-of-file mark of DOS:
//    restoreEndOfFileMarks, below. So a 1C is read as 1A, and saved as 1A. A 1C that a request
//    holds is written as it is.
//  - Some hundred characters have two or three codes. Encoding takes that of JIS, or else NEC's for
//    what is in its row 13 and IBM's for the rest. Texts with the others are saved in variants, the
//    names of which are ours:
//      x-Shift_JIS-nec    NEC's codes rather than JIS's and IBM's
//      x-Shift_JIS-ibm    IBM's codes rather than NEC's
#pragma once

#include <memory>
#include <string>

#include "platform/i18n/charsets/charset.h"

namespace platform::i18n {

/// Replaces U+001C by U+001A in the text of a file in `charset` when that is "Shift_JIS", in just
/// this spelling; does nothing for others. Linear.
void restoreEndOfFileMarks(std::u16string& text, const std::string& charset);

/// The same on text that is encoded in `charset`. Neither code is part of any other character.
void restoreEndOfFileMarks(std::string& bytes, const std::string& charset);

namespace detail {

/// Open the variants.
std::unique_ptr<Charset> makeShiftJisNec(std::string name, bool strict);
std::unique_ptr<Charset> makeShiftJisIbm(std::string name, bool strict);

}  // namespace detail

}  // namespace platform::i18n
