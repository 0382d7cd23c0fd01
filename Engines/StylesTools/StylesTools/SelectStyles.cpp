// SelectStyles of Diagnostics.h: the part of a document that some styles
// depend on, so that a large document answers for one style cheaply.
#include <StylesTools/Diagnostics.h>

#include <Internal/ToolsSupport.h>

#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/String.h>

#include <algorithm>
#include <type_traits>
#include <unordered_set>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {

using detail::Text;

namespace {

constexpr char16_t kInherits[] = u"inherits";

using Selection = std::unordered_set<const Json::Value*>;

// The style members of `document` (their values) that the styles called
// `names` depend on.
Selection SelectMembers(const Json::Object& document, const std::vector<Text>& names) {
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
  Selection selected;
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

  return selected;
}

// The sheet's own members of `document` and its selected style members, in
// document order: copies from a const document, else moved out of it, each
// category let go as soon as its members are taken.
template <class Document>
Json::Object Cut(Document& document, const Selection& selected) {
  constexpr bool kMove = !std::is_const<Document>::value;
  const auto take = [](auto& item) -> decltype(auto) {
    if constexpr (kMove)
      return std::move(item);
    else
      return static_cast<const std::remove_reference_t<decltype(item)>&>(item);
  };
  Json::Object part;
  for (auto& member : document) {
    auto* category = member.value.template GetIf<Json::Object>();
    if (!category) {
      part.AddValue(take(member.name), take(member.value));
      continue;
    }
    Json::Object kept;
    for (auto& style : *category)
      if (selected.count(&style.value))
        kept.AddValue(take(style.name), take(style.value));
    if constexpr (kMove)
      member.value = Json::Value();
    if (!kept.IsEmpty())
      part.AddValue(take(member.name), Json::Value(std::move(kept)));
  }
  return part;
}

} // namespace

Json::Object SelectStyles(const Json::Object& document, const std::vector<Text>& names) {
  return Cut(document, SelectMembers(document, names));
}

Json::Object SelectStyles(Json::Object&& document, const std::vector<Text>& names) {
  const Selection selected = SelectMembers(document, names);
  return Cut(document, selected);
}

} // namespace Tools
} // namespace Styles
