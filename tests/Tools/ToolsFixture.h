// Shared setup of the toolkit's tests: the built-in schema registered for
// the length of a test, and documents written as UTF-8 literals.
#pragma once

#include <StylesTools/Schema.h>

#include <Styles/StyleSheet.h>

#include <gtest/gtest.h>

#include <string>

namespace Styles {
namespace Tools {
namespace testing {

using Text = ZelStringT<char16_t>;

inline Text U16(const std::string& utf8) { return Text(ZelPlatform::Utf8ToUtf16(utf8)); }
inline std::string U8(const Text& text) { return ZelPlatform::Utf16ToUtf8(text.GetView()); }

// The text a sheet exports, temporary properties included.
inline std::string Exported(const StyleSheet& sheet) {
  Text text;
  sheet.ExportToString(text, true);
  return U8(text);
}

class DefaultSchemaTest : public ::testing::Test {
protected:
  void SetUp() override {
    SchemaError error;
    ASSERT_TRUE(RegisterSchema(DefaultSchema(), m_registration, error)) << U8(error.message);
  }
  void TearDown() override { DeregisterSchema(m_registration); }

  SchemaRegistration m_registration;
};

} // namespace testing
} // namespace Tools
} // namespace Styles
