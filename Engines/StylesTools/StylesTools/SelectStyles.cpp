// SelectStyles of Diagnostics.h: the part of a document that some styles
// depend on, so that a large document answers for one style cheaply.
#include <StylesTools/Diagnostics.h>

#include <Internal/ToolsSupport.h>

#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/String.h>

#include <algorithm>
#include <unordered_set>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {

using detail::Text;

namespace {
constexpr char16_t kInherits[] = u"inherits";
} // namespace

Json::Object SelectStyles(const Json::Object& document, const std::vector<Text>& names) {
  StyleManager& manager = GetStyleManager();
  // Every style member of a registered category, sorted by name ignoring
  // case (one block, not a node per name: documents may be large).
  using Entry = std::pair<std::u16string_view, const Json::Value*>;
  std::vector<Entry> members;
  for (std::size_t i = 0; i < document.GetSize(); ++i) {
    const Json::Object* category = document.GetValue(i).GetIf<Json::Object>();
    if (!category || !manager.CategoryExists(document.GetValueName(i)))
      continue;
    for (std::size_t j = 0; j < category->GetSize(); ++j)
      members.emplace_back(category->GetValueName(j).GetView(), &category->GetValue(j));
  }
  const auto byName = [](const Entry& a, const Entry& b) {
    return ZelUtils::String::LessThanCaseInsensitive()(a.first, b.first);
  };
  std::stable_sort(members.begin(), members.end(), byName);

  // The names needed, found by following every "inherits" at any depth.
  const WImportStyleInfo& info = manager.GetImportStyleInfo();
  std::unordered_set<const Json::Value*> selected;
  std::vector<const Json::Value*> pending;
  const auto need = [&](const Text& name) {
    if (info.names.count(name))
      return;
    const auto renamed = info.renames.find(name);
    const Entry key((renamed != info.renames.end() ? renamed->second : name).GetView(), nullptr);
    const auto [first, last] = std::equal_range(members.begin(), members.end(), key, byName);
    for (auto member = first; member != last; ++member)
      if (selected.insert(member->second).second)
        pending.push_back(member->second);
  };
  for (const Text& name : names)
    need(name);
  while (!pending.empty()) {
    const Json::Value* value = pending.back();
    pending.pop_back();
    if (const Json::Object* object = value->GetIf<Json::Object>()) {
      for (std::size_t i = 0; i < object->GetSize(); ++i) {
        const Json::Value& member = object->GetValue(i);
        if (const Text* parent = member.GetIf<Text>()) {
          if (object->GetValueName(i) == kInherits)
            need(*parent);
        } else if (member.Is<Json::Object>() || member.Is<Json::Array>()) {
          pending.push_back(&member); // substyles and their lists
        }
      }
    } else if (const Json::Array* array = value->GetIf<Json::Array>()) {
      for (std::size_t i = 0; i < array->GetSize(); ++i)
        pending.push_back(&array->GetValue(i));
    }
  }

  Json::Object part;
  for (std::size_t i = 0; i < document.GetSize(); ++i) {
    const Text& name = document.GetValueName(i);
    const Json::Value& value = document.GetValue(i);
    const Json::Object* category = value.GetIf<Json::Object>();
    if (!category) {
      part.AddValue(name, value);
      continue;
    }
    Json::Object kept;
    for (std::size_t j = 0; j < category->GetSize(); ++j)
      if (selected.count(&category->GetValue(j)))
        kept.AddValue(category->GetValueName(j), category->GetValue(j));
    if (!kept.IsEmpty())
      part.AddValue(name, Json::Value(std::move(kept)));
  }
  return part;
}

} // namespace Tools
} // namespace Styles
