// StyleSheet::ImportFromString of the input (as UTF-8) into a sheet of a host
// with every kind of property. A plain sheet (compact parse, direct export)
// and a derived one (ImportJson, ExportJson) must end alike; the export must
// read back into a fresh sheet and write the same text again; the string
// pool must not grow; and deleting and flattening the styles read must leave
// a sheet that still exports.
#include "FuzzCheck.h"

#include <Styles/Styles.h>

#include <ZelPlatform/ZelString.h>
#include <ZelPref/ConversionPolicy.h>

#include <cstddef>
#include <cstdint>
#include <exception>
#include <string_view>
#include <vector>

using namespace Styles;
using Text = ZelStringT<char16_t>;
using ZelUtils::Any;

namespace {

template <class T> bool Holds(const Any& value) { return value.IsTypeCompatible<T>(); }

class TemporaryProperty : public StyleProperty {
public:
  using StyleProperty::StyleProperty;
  bool IsTemporary() const override { return true; }
};

class DeprecatedProperty : public StyleProperty {
public:
  using StyleProperty::StyleProperty;
  bool IsDeprecated() const override { return true; }
};

// Reads and writes through the virtual ImportJson and ExportJson.
class DerivedSheet : public StyleSheet {};

StyleProperty* Number(double value = 0) {
  return new StyleProperty(Any(value), new ZelPref::NumberConversionPolicy, &Holds<double>);
}

// Paragraphs "p" and characters "c", each with plain values; paragraphs also
// with a temporary, a deprecated and a version-2 property, a character
// substyle and two substyle lists; characters nest; ordinary styles ("style")
// hold a character substyle.
void RegisterHost() {
  StyleManager& manager = GetStyleManager();
  manager.SetCurrentVersion(2);
  const PropertyKey paragraph(u"p"), character(u"c");
  manager.RegisterCategory(character, u"C", true, false);
  manager.RegisterCategory(paragraph, u"P", false, false);
  for (const PropertyKey& category : {paragraph, character}) {
    manager.RegisterProperty(category, PropertyKey(u"size"), Number());
    manager.RegisterProperty(
        category, PropertyKey(u"name"),
        new StyleProperty(Any(Text()), new ZelPref::TextConversionPolicy, &Holds<Text>));
  }
  manager.RegisterProperty(paragraph, PropertyKey(u"xScale"), Number(1));
  manager.RegisterProperty(character, PropertyKey(u"angle"), Number());
  manager.RegisterProperty(
      paragraph, PropertyKey(u"draft"),
      new TemporaryProperty(Any(false), new ZelPref::BooleanConversionPolicy, &Holds<bool>));
  manager.RegisterProperty(
      paragraph, PropertyKey(u"old"),
      new DeprecatedProperty(Any(Text()), new ZelPref::TextConversionPolicy, &Holds<Text>));
  manager.RegisterProperty(
      paragraph, PropertyKey(u"count"),
      new StyleProperty(Any(0), new ZelPref::IntegerConversionPolicy, &Holds<int>, 2));
  RegisterSubstyleSet(paragraph, character);
  manager.RegisterProperty(paragraph, PropertyKey(u"runs"), new StyleArrayProperty(character));
  manager.RegisterProperty(paragraph, PropertyKey(u"cells"),
                           new StyleArrayProperty(PropertyKey::Empty));
  manager.RegisterProperty(character, PropertyKey(u"nested"), new StyleSetProperty(character));
  RegisterStyleCategory(u"Style");
}

// Styles already in the sheet, so that imports replace and link to them.
constexpr char16_t kSeed[] =
    uR"({"p": {"Base": {"size": "3"}, "Body": {"inherits": "Base", "c": {"inherits": "Strong"}}},
        "c": {"Strong": {"size": "7", "nested": {"angle": "1"}}}})";

struct Outcome {
  bool accepted = false;
  bool threw = false;
  Text exported;
};

Outcome Import(StyleSheet& sheet, const Text& text, bool replace) {
  FUZZ_CHECK(sheet.ImportFromString(kSeed, false));
  Outcome outcome;
  try {
    outcome.accepted = sheet.ImportFromString(text, replace);
  } catch (const std::exception&) {
    outcome.threw = true; // what was read so far stays; the sheet must be sound
  }
  sheet.ExportToString(outcome.exported, true);
  return outcome;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const bool registered = (RegisterHost(), true);
  (void)registered;
  const std::size_t poolSize = StringPool::Get().GetSize();
  const Text text(
      ZelPlatform::Utf8ToUtf16(std::string_view(reinterpret_cast<const char*>(data), size)));
  const bool replace = size % 2 == 1;

  StyleSheet sheet;
  DerivedSheet derived;
  const Outcome plain = Import(sheet, text, replace);
  const Outcome virtualRoad = Import(derived, text, replace);
  FUZZ_CHECK(plain.accepted == virtualRoad.accepted && plain.threw == virtualRoad.threw);
  FUZZ_CHECK(plain.exported == virtualRoad.exported);
  FUZZ_CHECK(sheet.GetVersion() == derived.GetVersion());

  // Styles that an exception left without a category are written under ""
  // and not read back; one more round trip must then change nothing.
  Text again = plain.exported;
  for (int round = plain.threw ? 0 : 1; round < 2; ++round) {
    StyleSheet copy;
    FUZZ_CHECK(copy.ImportFromString(again, true));
    const Text before = again;
    copy.ExportToString(again, true);
    FUZZ_CHECK(round == 0 || again == before);
  }
  FUZZ_CHECK(StringPool::Get().GetSize() == poolSize);

  std::vector<Style*> doomed;
  const std::vector<Style*> styles = sheet.GetStyles();
  for (std::size_t i = 0; i < styles.size(); i += 2)
    doomed.push_back(styles[i]);
  sheet.DeleteStyles(StyleSpan(doomed, false));
  for (Style* style : sheet.GetStyles()) {
    try {
      style->Flatten();
    } catch (const std::exception&) {
      // A value of the wrong kind where a substyle must be may throw.
    }
  }
  sheet.ExportToString(again, true);
  return 0;
}
