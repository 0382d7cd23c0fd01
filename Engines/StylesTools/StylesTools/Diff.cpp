#include <StylesTools/Diff.h>

#include <StylesTools/Provenance.h>

#include <Internal/ToolsSupport.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <algorithm>
#include <map>
#include <set>
#include <string>
#include <unordered_map>

namespace Styles {
namespace Tools {

using detail::Text;
using detail::Widen;
using Kind = Difference::Kind;

namespace {

const std::vector<Style*> kNoStyles;

// Compares two styles of one category of the two sheets; either may be null,
// which stands for a style that holds nothing.
class StylePairDiff {
public:
  StylePairDiff(const StyleSheet& oldSheet, const StyleSheet& newSheet, const PropertyKey& category,
                const Text& name, std::vector<Difference>& out)
      : m_old(oldSheet), m_new(newSheet), m_category(category), m_name(name), m_out(out),
        m_first(out.size()) {}

  void Own(const Style* a, const Style* b, const Text& prefix) {
    if (!prefix.IsEmpty() || (a && b)) {
      const Text parentA = a ? m_old.GetStyleName(a->GetParent()) : Text();
      const Text parentB = b ? m_new.GetStyleName(b->GetParent()) : Text();
      if (parentA.CompareNoCase(parentB) != 0)
        Add(Kind::ParentChanged, prefix.IsEmpty() ? prefix : Trimmed(prefix), parentA,
            !parentA.IsEmpty(), parentB, !parentB.IsEmpty());
    }
    const Style* any = b ? b : a;
    const StyleCategory* category = any ? any->GetCategory().get() : nullptr;
    if (!category)
      return;
    for (const PropertyKey& key : category->GetPropertyOrder()) {
      const BaseStyleProperty* behaviour = category->GetStyleProperty(key);
      if (!behaviour)
        continue;
      const ZelUtils::Any* valueA = a ? a->GetProperties().Find(key) : nullptr;
      const ZelUtils::Any* valueB = b ? b->GetProperties().Find(key) : nullptr;
      if (!valueA && !valueB)
        continue;
      const Text path = prefix + key.GetString();
      if (behaviour->IsSubstyle()) {
        const Style* subA = SubstyleOf(valueA);
        const Style* subB = SubstyleOf(valueB);
        if (subA || subB)
          Own(subA, subB, path + u".");
        continue;
      }
      const auto* listA = valueA ? valueA->GetIf<std::vector<Style*>>() : nullptr;
      const auto* listB = valueB ? valueB->GetIf<std::vector<Style*>>() : nullptr;
      if (listA || listB) {
        const std::vector<Style*>& elementsA = listA ? *listA : kNoStyles;
        const std::vector<Style*>& elementsB = listB ? *listB : kNoStyles;
        if (elementsA.size() != elementsB.size() || !valueA || !valueB)
          Add(Kind::ValueChanged, path, valueA ? FormatValue(*behaviour, *valueA) : Text(), valueA,
              valueB ? FormatValue(*behaviour, *valueB) : Text(), valueB);
        for (std::size_t i = 0; i < std::max(elementsA.size(), elementsB.size()); ++i)
          Own(i < elementsA.size() ? elementsA[i] : nullptr,
              i < elementsB.size() ? elementsB[i] : nullptr,
              path + u"[" + Widen(std::to_string(i)) + u"].");
        continue;
      }
      if (valueA && valueB && behaviour->IsEqual(*valueA, *valueB))
        continue;
      Add(Kind::ValueChanged, path, valueA ? FormatValue(*behaviour, *valueA) : Text(), valueA,
          valueB ? FormatValue(*behaviour, *valueB) : Text(), valueB);
    }
  }

  // The caches, one per sheet, outlive the pair: a chain's styles share what
  // their ancestors resolved.
  void Effective(const Style& a, const Style& b, ResolutionCache& cacheA, ResolutionCache& cacheB) {
    std::set<Text> reported;
    for (std::size_t i = m_first; i < m_out.size(); ++i)
      if (m_out[i].kind == Kind::ValueChanged)
        reported.insert(m_out[i].path);
    const std::vector<EffectiveValue> valuesA = ListEffectiveValues(a, cacheA);
    const std::vector<EffectiveValue> valuesB = ListEffectiveValues(b, cacheB);
    std::unordered_map<std::u16string, const EffectiveValue*> byPath;
    for (const EffectiveValue& value : valuesA)
      byPath.emplace(value.path.GetStdString(), &value);
    std::set<Text> seen;
    for (const EffectiveValue& value : valuesB) {
      seen.insert(value.path);
      if (reported.count(value.path))
        continue;
      const auto found = byPath.find(value.path.GetStdString());
      const EffectiveValue* old = found == byPath.end() ? nullptr : found->second;
      if (old && SameValue(*old, value))
        continue;
      Add(Kind::EffectiveChanged, value.path,
          old ? FormatValue(*old->behaviour, *old->resolution.value) : Text(), old != nullptr,
          FormatValue(*value.behaviour, *value.resolution.value), true);
    }
    for (const EffectiveValue& value : valuesA)
      if (!seen.count(value.path) && !reported.count(value.path))
        Add(Kind::EffectiveChanged, value.path,
            FormatValue(*value.behaviour, *value.resolution.value), true, Text(), false);
  }

  void Add(Kind kind, const Text& path, const Text& oldValue, bool hasOld, const Text& newValue,
           bool hasNew) {
    Difference difference;
    difference.kind = kind;
    difference.category = m_category;
    difference.style = m_name;
    difference.path = path;
    difference.oldValue = hasOld ? oldValue : Text();
    difference.newValue = hasNew ? newValue : Text();
    difference.hasOld = hasOld;
    difference.hasNew = hasNew;
    m_out.push_back(std::move(difference));
  }

private:
  static const Style* SubstyleOf(const ZelUtils::Any* value) {
    Style* const* substyle = value ? value->GetIf<Style*>() : nullptr;
    return substyle ? *substyle : nullptr;
  }
  static Text Trimmed(const Text& prefix) {
    return Text(prefix.GetView().substr(0, prefix.GetLength() - 1));
  }

  static bool SameValue(const EffectiveValue& a, const EffectiveValue& b) {
    const ZelUtils::Any& valueA = *a.resolution.value;
    const ZelUtils::Any& valueB = *b.resolution.value;
    const auto* listA = valueA.GetIf<std::vector<Style*>>();
    const auto* listB = valueB.GetIf<std::vector<Style*>>();
    if (listA || listB) // the elements are compared entry by entry
      return listA && listB && listA->size() == listB->size();
    return b.behaviour->IsEqual(valueA, valueB);
  }

  const StyleSheet& m_old;
  const StyleSheet& m_new;
  PropertyKey m_category;
  Text m_name;
  std::vector<Difference>& m_out;
  std::size_t m_first; // this pair's first difference in m_out
};

} // namespace

std::vector<Difference> DiffSheets(const StyleSheet& oldSheet, const StyleSheet& newSheet,
                                   bool effective) {
  StyleSheet::CategoryStyleMap oldStyles, newStyles;
  oldSheet.GenerateCategoryStyleMap(oldStyles);
  newSheet.GenerateCategoryStyleMap(newStyles);
  // Categories in the order of their names, so that output is stable.
  std::map<Text, PropertyKey> categories;
  for (const auto* styles : {&oldStyles, &newStyles})
    for (const auto& entry : *styles)
      categories.emplace(entry.first.GetString(), entry.first);

  std::vector<Difference> out;
  ResolutionCache oldCache, newCache;
  static const StyleSheet::NameIndex kEmpty;
  for (const auto& [text, category] : categories) {
    const auto oldFound = oldStyles.find(category);
    const auto newFound = newStyles.find(category);
    const StyleSheet::NameIndex& a = oldFound == oldStyles.end() ? kEmpty : oldFound->second;
    const StyleSheet::NameIndex& b = newFound == newStyles.end() ? kEmpty : newFound->second;
    auto itA = a.begin();
    auto itB = b.begin();
    while (itA != a.end() || itB != b.end()) {
      const int order = itA == a.end()   ? 1
                        : itB == b.end() ? -1
                                         : itA->first.CompareNoCase(itB->first);
      if (order < 0) {
        StylePairDiff(oldSheet, newSheet, category, itA->first, out)
            .Add(Kind::Removed, Text(), Text(), false, Text(), false);
        ++itA;
      } else if (order > 0) {
        StylePairDiff(oldSheet, newSheet, category, itB->first, out)
            .Add(Kind::Added, Text(), Text(), false, Text(), false);
        ++itB;
      } else {
        StylePairDiff pair(oldSheet, newSheet, category, itB->first, out);
        pair.Own(itA->second, itB->second, Text());
        if (effective && itA->second && itB->second)
          pair.Effective(*itA->second, *itB->second, oldCache, newCache);
        ++itA;
        ++itB;
      }
    }
  }
  return out;
}

} // namespace Tools
} // namespace Styles
