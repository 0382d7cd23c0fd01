// Shared setup of the preset tests: a fresh folder per test, removed after
// it, with the preset folder inside; and a category whose "tag" records every
// destroyed value and refuses to be written when it reads "explode".
#pragma once

#include <Styles/FolderPresetManager.h>
#include <Styles/Style.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>

#include <ZelPref/ConversionPolicy.h>

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

#include <unistd.h>

namespace Styles {
namespace testing {

using Text = ZelStringT<char16_t>;
using Names = std::vector<Text>;

inline Names& DestroyedTags() {
  static Names tags;
  return tags;
}
inline bool IsPresetText(const ZelUtils::Any& value) { return value.GetIf<Text>() != nullptr; }
inline bool IsPresetNumber(const ZelUtils::Any& value) { return value.GetIf<double>() != nullptr; }

class PresetTagProperty : public StyleProperty {
public:
  PresetTagProperty() : StyleProperty(Text(), new ZelPref::TextConversionPolicy, &IsPresetText) {}
  void DestroyPropertyData(const ZelUtils::Any& value) const override {
    DestroyedTags().push_back(value.Get<Text>());
  }
  bool Serialize(const StyleSheet& sheet, const Style* style, const ZelUtils::Any& value,
                 JsonValue& out) const override {
    if (value.Get<Text>() == u"explode")
      throw std::runtime_error("refused");
    return StyleProperty::Serialize(sheet, style, value, out);
  }
};

class PresetFixture : public ::testing::Test {
protected:
  static inline const PropertyKey kCategory{u"presetTestParagraph"};
  static inline const PropertyKey kSize{u"size"};
  static inline const PropertyKey kFont{u"font"};
  static inline const PropertyKey kTag{u"tag"};

  void SetUp() override {
    std::filesystem::remove_all(m_root);
    std::filesystem::create_directories(m_root / "presets");
    StyleManager& manager = GetStyleManager();
    m_savedVersion = manager.GetCurrentVersion();
    manager.SetCurrentVersion(3); // values are written from version 0 on
    manager.RegisterCategory(kCategory, u"Paragraph", false, false);
    manager.RegisterProperty(
        kCategory, kSize,
        new StyleProperty(12.0, new ZelPref::NumberConversionPolicy, &IsPresetNumber));
    manager.RegisterProperty(
        kCategory, kFont,
        new StyleProperty(Text(u"Serif"), new ZelPref::TextConversionPolicy, &IsPresetText));
    manager.RegisterProperty(kCategory, kTag, new PresetTagProperty);
    DestroyedTags().clear();
  }
  void TearDown() override {
    GetStyleManager().DeregisterCategory(kCategory);
    GetStyleManager().SetCurrentVersion(m_savedVersion);
    std::filesystem::remove_all(m_root);
  }

  // The preset folder (temp folders have ASCII names).
  Text Folder() const { return (m_root / "presets").u16string(); }
  std::filesystem::path FileOf(const std::string& name) const { return m_root / "presets" / name; }
  std::string ReadFile(const std::string& name) const {
    std::ifstream in(FileOf(name), std::ios::binary);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  void WriteFile(const std::string& name, const std::string& bytes) const {
    std::ofstream(FileOf(name), std::ios::binary) << bytes;
  }
  // Every path under the test's folder, relative to it.
  std::set<std::string> Entries() const {
    std::set<std::string> entries;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(m_root))
      entries.insert(std::filesystem::relative(entry.path(), m_root).string());
    return entries;
  }
  // A free style; the caller owns it.
  static Style* MakeStyle(const Text& tag, double size = 12.0) {
    Style* style = new Style(nullptr, kCategory);
    style->SetProperty(kTag, tag);
    style->SetProperty(kSize, size);
    return style;
  }
  static Text Tag(const Style* style) { return style->GetProperty(kTag).Get<Text>(); }
  static double Size(const Style* style) { return style->GetProperty(kSize).Get<double>(); }

  const std::filesystem::path m_root =
      std::filesystem::path(::testing::TempDir()) /
      ("PresetTest-" + std::to_string(::getpid()) + "-" +
       ::testing::UnitTest::GetInstance()->current_test_info()->name());

private:
  int m_savedVersion = 0;
};

} // namespace testing
} // namespace Styles
