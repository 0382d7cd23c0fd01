// SelectStyles of Diagnostics.h: the part of a document that some styles
// depend on, so that a large document answers for one style cheaply.
#include <StylesTools/Diagnostics.h>

#include <Internal/ToolsSupport.h>
#include <Internal/TreeRef.h>

#include <Styles/StyleManager.h>

#include <Json/Json.h>
#include <ZelUtils/String.h>

#include <algorithm>
#include <cstdint>
#include <type_traits>
#include <utility>
#include <vector>

namespace Styles {
namespace Tools {

using detail::Text;

namespace {

constexpr char16_t kInherits[] = u"inherits";
constexpr char16_t kVersion[] = u"version";
constexpr char16_t kExternalID[] = u"id";

// The selected style members: per member of the document, one flag per
// member of that category (none for other members).
using Selection = std::vector<std::vector<bool>>;

// The style members of `document` that the styles called `names` depend on.
template <class Ref> Selection SelectMembers(const Ref& document, const std::vector<Text>& names) {
  StyleManager& manager = GetStyleManager();
  // Every style member of a registered category, sorted by name ignoring
  // case (one block, not a node per name: documents may be large).
  struct Entry {
    std::u16string_view name;
    std::uint32_t category, member;
  };
  std::vector<Entry> members;
  Selection selected(document.GetSize());
  for (std::size_t i = 0; i < document.GetSize(); ++i) {
    const Ref category = document.GetMember(i);
    if (!category.IsObject() || !manager.CategoryExists(Text(document.GetMemberName(i))))
      continue;
    selected[i].resize(category.GetSize());
    for (std::size_t j = 0; j < category.GetSize(); ++j)
      members.push_back(Entry{category.GetMemberName(j), std::uint32_t(i), std::uint32_t(j)});
  }
  const auto byName = [](const Entry& a, const Entry& b) {
    return ZelUtils::String::LessThanCaseInsensitive()(a.name, b.name);
  };
  std::stable_sort(members.begin(), members.end(), byName);

  // The names needed, found by following every "inherits" at any depth.
  const WImportStyleInfo& info = manager.GetImportStyleInfo();
  std::vector<Ref> pending;
  const auto need = [&](const Text& name) {
    if (info.names.count(name))
      return;
    const auto renamed = info.renames.find(name);
    const Entry key{(renamed != info.renames.end() ? renamed->second : name).GetView(), 0, 0};
    const auto [first, last] = std::equal_range(members.begin(), members.end(), key, byName);
    for (auto member = first; member != last; ++member)
      if (!selected[member->category][member->member]) {
        selected[member->category][member->member] = true;
        pending.push_back(document.GetMember(member->category).GetMember(member->member));
      }
  };
  for (const Text& name : names)
    need(name);
  while (!pending.empty()) {
    const Ref value = pending.back();
    pending.pop_back();
    if (value.IsObject()) {
      for (std::size_t i = 0; i < value.GetSize(); ++i) {
        const Ref member = value.GetMember(i);
        if (member.IsString()) {
          if (value.GetMemberName(i) == kInherits)
            need(Text(member.GetString()));
        } else if (member.IsObject() || member.IsArray()) {
          pending.push_back(member); // substyles and their lists
        }
      }
    } else if (value.IsArray()) {
      for (std::size_t i = 0; i < value.GetSize(); ++i)
        pending.push_back(value.GetElement(i));
    }
  }
  return selected;
}

// The sheet's own members of `document` and its selected style members, in
// document order: copies from a const document, else moved out of it, each
// category let go as soon as its members are taken.
template <class Document> Json::Object Cut(Document& document, const Selection& selected) {
  constexpr bool kMove = !std::is_const<Document>::value;
  const auto take = [](auto& item) -> decltype(auto) {
    if constexpr (kMove)
      return std::move(item);
    else
      return static_cast<const std::remove_reference_t<decltype(item)>&>(item);
  };
  Json::Object part;
  std::size_t i = 0;
  for (auto& member : document) {
    const std::vector<bool>& flags = selected[i++];
    auto* category = member.value.template GetIf<Json::Object>();
    if (!category) {
      part.AddValue(take(member.name), take(member.value));
      continue;
    }
    Json::Object kept;
    std::size_t j = 0;
    for (auto& style : *category)
      if (j < flags.size() && flags[j++])
        kept.AddValue(take(style.name), take(style.value));
    if constexpr (kMove)
      member.value = Json::Value();
    if (!kept.IsEmpty())
      part.AddValue(take(member.name), Json::Value(std::move(kept)));
  }
  return part;
}

// Writes `value` and everything in it.
bool WriteValue(Json::Writer& writer, const Json::Document::Ref& value) {
  if (value.IsString())
    return writer.String(value.GetString());
  if (value.IsObject()) {
    bool written = writer.StartObject();
    for (std::size_t i = 0; i < value.GetSize(); ++i)
      written =
          written && writer.Key(value.GetMemberName(i)) && WriteValue(writer, value.GetMember(i));
    return written && writer.EndObject();
  }
  if (value.IsArray()) {
    bool written = writer.StartArray();
    for (std::size_t i = 0; i < value.GetSize(); ++i)
      written = written && WriteValue(writer, value.GetElement(i));
    return written && writer.EndArray();
  }
  if (value.IsNumber())
    return writer.Write(Json::Value(value.GetNumber()));
  if (value.IsBool())
    return writer.Write(Json::Value(value.GetBool()));
  return writer.Write(Json::Value());
}

} // namespace

Json::Object SelectStyles(const Json::Object& document, const std::vector<Text>& names) {
  return Cut(document, SelectMembers(detail::TreeRef(document), names));
}

Json::Object SelectStyles(Json::Object&& document, const std::vector<Text>& names) {
  const Selection selected = SelectMembers(detail::TreeRef(document), names);
  return Cut(document, selected);
}

Text SelectStylesText(const Json::Document& document, const std::vector<Text>& names) {
  const Json::Document::Ref root = document.GetRoot();
  if (!root.IsObject())
    return Text();
  const Selection selected = SelectMembers(root, names);
  Json::Writer writer(false);
  bool written = writer.StartObject();
  for (std::size_t i = 0; i < root.GetSize(); ++i) {
    const std::u16string_view name = root.GetMemberName(i);
    const Json::Document::Ref value = root.GetMember(i);
    if (!value.IsObject()) {
      if (name == kVersion || name == kExternalID)
        written = written && writer.Key(name) && WriteValue(writer, value);
      continue;
    }
    const std::vector<bool>& flags = selected[i];
    if (std::find(flags.begin(), flags.end(), true) == flags.end())
      continue;
    written = written && writer.Key(name) && writer.StartObject();
    for (std::size_t j = 0; j < flags.size(); ++j)
      if (flags[j])
        written =
            written && writer.Key(value.GetMemberName(j)) && WriteValue(writer, value.GetMember(j));
    written = written && writer.EndObject();
  }
  return written && writer.EndObject() ? writer.TakeText() : Text();
}

} // namespace Tools
} // namespace Styles
