// The sheet document's own members and its byte encoding in streams, shared
// by the document reader and the document writer so that both agree.
#pragma once

#include <ZelUtils/TextStream.h>

namespace Styles {
namespace detail {

// Member names of the document object.
constexpr char16_t k_strVersion[] = u"version";
constexpr char16_t k_strExternalID[] = u"id";

// The byte encoding of documents in streams, the same both ways.
constexpr ZelUtils::TextStream::Encoding kDocumentEncoding = ZelUtils::TextStream::UTF8;

} // namespace detail
} // namespace Styles
