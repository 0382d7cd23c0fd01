// Reading the styles command's documents: files or standard input as bytes,
// with the system's reason when they cannot be read, and checked as UTF-8.
#pragma once

#include <StylesTools/Diagnostics.h>

#include <ZelPlatform/ZelString.h>

#include <optional>
#include <string>
#include <string_view>

namespace StylesCommand {

using Text = ZelStringT<char16_t>;

// The bytes of the file `path`, or of standard input for "-". False, with the
// reason in `reason`, when they cannot be read.
bool ReadBytes(const std::string& path, std::string& bytes, std::string& reason);

// The first sequence of `bytes` that is not UTF-8, as an "invalid-utf8" error
// with its line and column (from 1, columns in characters); none when every
// byte is part of a character, or when a UTF-16 byte-order mark starts them.
std::optional<Styles::Tools::Diagnostic> FindInvalidUtf8(std::string_view bytes);

// `bytes` decoded from UTF-8, a leading byte-order mark dropped; what is not
// UTF-8 becomes U+FFFD.
Text DecodeUtf8(std::string bytes);

} // namespace StylesCommand
