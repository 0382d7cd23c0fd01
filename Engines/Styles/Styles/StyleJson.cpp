// One style's JSON object, and Style's operations that write or read it;
// the document reader and writer go through it for every style.
#include <Styles/Internal/StyleJson.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <Styles/Internal/JsonAccess.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <cmath>
#include <cstdint>
#include <memory>
#include <optional>
#include <typeinfo>
#include <utility>
#include <vector>

namespace Styles {

namespace {

// Fixed member names of a style's JSON object.
constexpr std::u16string_view k_strPropertyInherits = u"inherits";
constexpr std::u16string_view k_strExternalID = u"id";
constexpr std::u16string_view k_strExternalName = u"original";

// Where StyleJson::WriteMembers puts the members of a style: a value tree.
class TreeSink {
public:
  explicit TreeSink(Json::Object& object) : m_object(object) {}
  void Text(std::u16string_view name, std::u16string_view text) {
    m_object.AddValue(ZelStringT<char16_t>(name), Json::Value(ZelStringT<char16_t>(text)));
  }
  void Property(const Style& style, const StyleSheet& sheet, bool includeTemporary,
                const PropertyMap::ConstEntry& entry) {
    const StyleCategory* category = style.GetCategory().get();
    const BaseStyleProperty* behaviour =
        category ? category->GetStyleProperty(entry.first) : nullptr;
    if (!behaviour || (!includeTemporary && behaviour->IsTemporary()))
      return;
    Json::Value value;
    if (behaviour->Serialize(sheet, &style, entry.second, value))
      m_object.AddValue(entry.first.GetString(), std::move(value));
  }

private:
  Json::Object& m_object;
};

// The same members written straight into JSON text. Members whose values are
// strings wait in the scratch and go to the writer together.
class WriterSink {
public:
  using TextScratch = detail::StyleJson::TextScratch;
  WriterSink(Json::Writer& writer, TextScratch& scratch) : m_writer(writer), m_scratch(scratch) {}
  void Text(std::u16string_view name, std::u16string_view text) { Add({name, text}); }
  void Property(const Style& style, const StyleSheet& sheet, bool,
                const PropertyMap::ConstEntry& entry) {
    const TextScratch::Plan plan = m_scratch.PlanFor(style.GetCategory().get(), entry.first);
    if (!plan.behaviour || Plain(plan, entry) ||
        Substyles(plan.kind, sheet, entry))
      return;
    if (plan.behaviour->Serialize(sheet, &style, entry.second, m_scratch.value)) {
      Flush();
      m_writer.Key(entry.first.GetView());
      m_writer.Write(m_scratch.value);
    }
  }
  // Writes the members still waiting.
  void Flush() {
    if (m_pending > 0)
      m_writer.Members(m_scratch.pending, m_pending);
    m_pending = 0;
  }

private:
  void Add(const Json::Writer::StringMember& member) {
    if (m_pending == TextScratch::kBatch)
      Flush();
    m_scratch.pending[m_pending++] = member;
  }
  // Substyles of the stock behaviours, written straight as their objects:
  // what Serialize gives, without a value tree. False for the general way.
  bool Substyles(detail::StyleJson::Kind kind, const StyleSheet& sheet,
                 const PropertyMap::ConstEntry& entry) {
    if (kind == detail::StyleJson::kSubstyle) {
      Style* const* substyle = entry.second.GetIf<Style*>();
      if (!substyle)
        return false;
      Flush();
      m_writer.Key(entry.first.GetView());
      if (*substyle)
        detail::StyleJson::Write(**substyle, sheet, m_writer, false, m_scratch);
      else
        m_writer.Write(Json::Value());
      return true;
    }
    if (kind != detail::StyleJson::kSubstyleList)
      return false;
    const auto* list = entry.second.GetIf<std::vector<Style*>>();
    if (!list)
      return false;
    Flush();
    m_writer.Key(entry.first.GetView());
    m_writer.StartArray();
    for (const Style* substyle : *list)
      if (substyle)
        detail::StyleJson::Write(*substyle, sheet, m_writer, false, m_scratch);
    m_writer.EndArray();
    return true;
  }
  // A plain property with a stock text or number policy: the member its
  // Serialize would give, without making a string or a value. False when the
  // general way must be taken (it also throws what Serialize throws).
  bool Plain(const TextScratch::Plan& plan, const PropertyMap::ConstEntry& entry) {
    if (plan.kind == detail::StyleJson::kText) {
      const auto* text = entry.second.GetIf<ZelStringT<char16_t>>();
      if (!text)
        return false;
      Add({entry.first.GetView(), text->GetView(), plan.quotedName});
      return true;
    }
    if (plan.kind != detail::StyleJson::kNumber)
      return false;
    const double* number = entry.second.GetIf<double>();
    if (!number || !std::isfinite(*number))
      return false;
    if (m_pending == TextScratch::kBatch)
      Flush();
    char16_t* digits = m_scratch.digits[m_pending];
    const char16_t* end = ZelPref::NumberConversionPolicy::WriteText(*number, digits);
    m_scratch.pending[m_pending++] = {
        entry.first.GetView(), {digits, static_cast<std::size_t>(end - digits)}, plan.quotedName};
    return true;
  }

  Json::Writer& m_writer;
  TextScratch& m_scratch;
  std::size_t m_pending = 0;
};

} // namespace

namespace detail {

template <class Sink>
void StyleJson::WriteMembers(const Style& style, const StyleSheet& sheet, bool includeTemporary,
                             Sink& sink) {
  const std::u16string_view parentName = sheet.FindStyleName(style.GetParent());
  if (!parentName.empty())
    sink.Text(k_strPropertyInherits, parentName);
  if (!style.GetExternalID().IsEmpty())
    sink.Text(k_strExternalID, style.GetExternalID().GetView());
  if (!style.GetExternalName().IsEmpty())
    sink.Text(k_strExternalName, style.GetExternalName().GetView());
  for (const PropertyMap::ConstEntry& entry : style.GetProperties())
    sink.Property(style, sheet, includeTemporary, entry);
}

void StyleJson::Write(const Style& style, const StyleSheet& sheet, JsonValue& out,
                      bool includeTemporary) {
  Json::Object& object = out.Emplace<Json::Object>();
  object.Reserve(style.GetProperties().size() + 3);
  TreeSink sink(object);
  WriteMembers(style, sheet, includeTemporary, sink);
}

StyleJson::TextScratch::Plan StyleJson::TextScratch::Learn(const StyleCategory* category,
                                                           const PropertyKey& key) {
  const BaseStyleProperty* behaviour = category ? category->GetStyleProperty(key) : nullptr;
  Plan plan{nullptr, kGeneral, {}};
  if (behaviour && (m_includeTemporary || !behaviour->IsTemporary())) {
    plan.kind = StyleJson::KindOf(*behaviour);
    // Substyles are written without temporary values: writing them straight
    // agrees with that only when the whole export leaves them out.
    if (m_includeTemporary && (plan.kind == kSubstyle || plan.kind == kSubstyleList))
      plan.kind = kGeneral;
    // Such a value is left out of a document older than its behaviour.
    if (plan.kind == kGeneral || m_sheet.GetVersion() >= behaviour->GetMinimumVersion())
      plan.behaviour = behaviour;
  }
  if (plan.behaviour && (plan.kind == kText || plan.kind == kNumber))
    plan.quotedName = m_quotedNames.emplace_back(Json::Writer::Quote(key.GetView())).GetView();
  if (2 * (m_filled + 1) > m_slots.size()) {
    std::vector<Slot> slots(2 * m_slots.size());
    slots.swap(m_slots);
    m_filled = 0;
    for (const Slot& slot : slots)
      if (slot.filled)
        Place(slot);
  }
  Place(Slot{category, key, plan, true});
  return plan;
}

void StyleJson::TextScratch::Place(const Slot& slot) {
  const std::size_t mask = m_slots.size() - 1;
  std::size_t i = Hash(slot.category, slot.key) & mask;
  while (m_slots[i].filled)
    i = (i + 1) & mask;
  m_slots[i] = slot;
  ++m_filled;
}

void StyleJson::Write(const Style& style, const StyleSheet& sheet, Json::Writer& writer,
                      bool includeTemporary, TextScratch& scratch) {
  writer.StartObject();
  WriterSink sink(writer, scratch);
  WriteMembers(style, sheet, includeTemporary, sink);
  sink.Flush();
  writer.EndObject();
}

StyleJson::Kind StyleJson::KindOf(const BaseStyleProperty& behaviour) {
  const std::type_info& type = typeid(behaviour);
  // Only the exact stock types are known to do what their policy gives.
  if (type == typeid(StyleProperty)) {
    if (const ZelPref::ConversionPolicy* policy = behaviour.GetConversionPolicy()) {
      if (typeid(*policy) == typeid(ZelPref::TextConversionPolicy))
        return kText;
      if (typeid(*policy) == typeid(ZelPref::NumberConversionPolicy))
        return kNumber;
    }
    return kGeneral;
  }
  if (type == typeid(StyleSetProperty))
    return kSubstyle;
  return type == typeid(StyleArrayProperty) ? kSubstyleList : kGeneral;
}

StyleJson::Kind StyleJson::ReadScratch::KindOf(const BaseStyleProperty& behaviour) {
  // Addresses are multiples of the allocation alignment; mix the bits.
  std::size_t slot = static_cast<std::size_t>(
      (reinterpret_cast<std::uintptr_t>(&behaviour) >> 4) * 0x9E3779B97F4A7C15ull >> 58);
  for (std::size_t probe = 0; probe < kSlots; ++probe, slot = (slot + 1) % kSlots) {
    if (m_behaviours[slot] == &behaviour)
      return m_kinds[slot];
    if (!m_behaviours[slot])
      break;
  }
  const Kind kind = StyleJson::KindOf(behaviour);
  if (!m_behaviours[slot]) {
    m_behaviours[slot] = &behaviour;
    m_kinds[slot] = kind;
  }
  return kind;
}

namespace {

enum class FixedMember { kNone, kInherits, kExternalID, kExternalName };

// Which fixed member `name` names; most names start with another letter.
FixedMember FixedMemberOf(std::u16string_view name) {
  if (name.empty() || (name[0] != u'i' && name[0] != u'o'))
    return FixedMember::kNone;
  if (name == k_strPropertyInherits)
    return FixedMember::kInherits;
  if (name == k_strExternalID)
    return FixedMember::kExternalID;
  return name == k_strExternalName ? FixedMember::kExternalName : FixedMember::kNone;
}

// Reads the string value of a plain property of the kind given (kText or
// kNumber) as its Deserialize would: its values own nothing and need no
// adjustment. False when the general way must be taken: for other kinds, and
// for a number the policy rejects.
bool ReadPlain(StyleJson::Kind kind, const BaseStyleProperty& behaviour,
               PropertyMap& properties, std::u16string_view text) {
  ZelUtils::Any value;
  if (kind == StyleJson::kText) {
    value = ZelUtils::Any(ZelStringT<char16_t>(text));
  } else if (kind == StyleJson::kNumber) {
    try {
      value = behaviour.GetConversionPolicy()->FromText(ZelStringT<char16_t>(text));
    } catch (const ZelPref::Detail::BadConversion&) {
      return false;
    }
  } else {
    return false;
  }
  // A repeated member replaces the value read before it.
  if (!properties.Insert(behaviour.GetName(), std::move(value)))
    *properties.Find(behaviour.GetName()) = std::move(value);
  return true;
}

} // namespace

template <class Access>
bool StyleJson::ReadSubstyles(Kind kind, const BaseStyleProperty& behaviour,
                              Style& style, const StyleSheet& sheet, typename Access::Value value,
                              ReadScratch& scratch) {
  if (kind == kSubstyle) {
    const auto object = Access::AsObject(value);
    if (!object)
      return false;
    std::unique_ptr<Style> substyle(new Style(nullptr, behaviour.GetElementCategoryName()));
    Read<Access>(*substyle, sheet, *object, scratch);
    substyle->SetOwner(&style, behaviour.GetName());
    // Adopted as it is; an own value already there (a repeated member) stays.
    if (style.m_properties.Insert(behaviour.GetName(), ZelUtils::Any(substyle.get())))
      substyle.release();
    return true;
  }
  if (kind != kSubstyleList)
    return false;
  const auto array = Access::AsArray(value);
  if (!array)
    return false;
  const PropertyKey elementCategory = behaviour.GetElementCategoryName();
  const PropertyKey& category =
      elementCategory == PropertyKey::Empty ? behaviour.GetCategoryKey() : elementCategory;
  std::vector<std::unique_ptr<Style>> read;
  read.reserve(Access::Size(*array));
  for (std::size_t i = 0; i < Access::Size(*array); ++i) {
    if (const auto object = Access::AsObject(Access::Element(*array, i))) {
      read.emplace_back(new Style(nullptr, category));
      Read<Access>(*read.back(), sheet, *object, scratch);
    }
  }
  std::vector<Style*> list;
  list.reserve(read.size());
  for (const std::unique_ptr<Style>& substyle : read)
    list.push_back(substyle.get());
  // The style stores copies; the substyles read here are freed with `read`.
  style.SetProperty(behaviour.GetName(), std::move(list));
  return true;
}

template <class Access>
void StyleJson::Read(Style& style, const StyleSheet& sheet, const typename Access::Object& object,
                     ReadScratch& scratch) {
  const std::shared_ptr<const StyleCategory> category = style.GetCategory();
  std::vector<std::pair<const BaseStyleProperty*, typename Access::Value>> deprecated;
  std::vector<const BaseStyleProperty*> needAdjustment;
  const std::size_t count = Access::Size(object);
  // Room for the members that can be properties, in one step.
  std::size_t fixedMembers = 0;
  for (std::size_t i = 0; i < count; ++i) {
    const std::u16string_view name = Access::Name(object, i);
    fixedMembers += FixedMemberOf(name) != FixedMember::kNone;
  }
  style.m_properties.Reserve(style.m_properties.size() + count - fixedMembers);
  for (std::size_t i = 0; i < count; ++i) {
    const std::u16string_view name = Access::Name(object, i);
    const typename Access::Value value = Access::Member(object, i);
    const FixedMember fixed = FixedMemberOf(name);
    if (fixed == FixedMember::kInherits) {
      const std::optional<std::u16string_view> parentName = Access::AsString(value);
      if (!parentName || parentName->empty())
        continue;
      Style* parent = ResolveParent(sheet, *parentName);
      // Never this style itself, nor a style that already inherits from it:
      // a parent cycle would make every lookup endless.
      if (parent && sheet.AcceptParent(style, *parent))
        style.SetParent(parent);
    } else if (fixed == FixedMember::kExternalID) {
      const std::optional<std::u16string_view> id = Access::AsString(value);
      if (id && !id->empty())
        style.SetExternalID(ZelStringT<char16_t>(*id));
    } else if (fixed == FixedMember::kExternalName) {
      const std::optional<std::u16string_view> externalName = Access::AsString(value);
      if (externalName && !externalName->empty())
        style.SetExternalName(ZelStringT<char16_t>(*externalName));
    } else {
      // Found by its text, so that names from documents are never pooled.
      const BaseStyleProperty* behaviour = category ? category->FindStyleProperty(name) : nullptr;
      if (!behaviour)
        continue;
      if (behaviour->IsDeprecated()) {
        deprecated.emplace_back(behaviour, value);
        continue;
      }
      const Kind kind = scratch.KindOf(*behaviour);
      const std::optional<std::u16string_view> text = Access::AsString(value);
      if (text && ReadPlain(kind, *behaviour, style.m_properties, *text))
        continue;
      if (!ReadSubstyles<Access>(kind, *behaviour, style, sheet, value, scratch))
        behaviour->Deserialize(sheet, &style, Access::ForBehaviour(value, scratch.value));
      if (behaviour->NeedAdjustementsForStyleIO())
        needAdjustment.push_back(behaviour);
    }
  }
  // Deprecated properties are read after all current ones, deliberately.
  for (const auto& [behaviour, value] : deprecated)
    behaviour->Deserialize(sheet, &style, Access::ForBehaviour(value, scratch.value));
  for (const BaseStyleProperty* behaviour : needAdjustment)
    behaviour->AdjustAfterDeserialize(sheet, &style);
}

Style* StyleJson::ResolveParent(const StyleSheet& sheet, std::u16string_view name) {
  const WImportStyleInfo& info = GetStyleManager().GetImportStyleInfo();
  if (!info.names.empty() || !info.renames.empty()) {
    const ZelStringT<char16_t> text(name);
    if (info.names.count(text))
      return nullptr;
    const auto renamed = info.renames.find(text);
    if (renamed != info.renames.end())
      return sheet.GetStyle(renamed->second);
  }
  return sheet.FindStyle(name);
}

template void StyleJson::Read<TreeAccess>(Style&, const StyleSheet&, const Json::Object&,
                                          ReadScratch&);
template void StyleJson::Read<DocumentAccess>(Style&, const StyleSheet&, const Json::Document::Ref&,
                                              ReadScratch&);

} // namespace detail

void Style::Serialize(const StyleSheet& sheet, JsonValue& out, bool includeTemporary) const {
  detail::StyleJson::Write(*this, sheet, out, includeTemporary);
}

ZelStringT<char16_t> Style::Serialize(const StyleSheet& sheet, bool format,
                                      bool includeTemporary) const {
  Json::Value value;
  Serialize(sheet, value, includeTemporary);
  return Json::ValueToString(value, format);
}

void Style::DeserializeJson(const StyleSheet& sheet, const Json::Object& object) {
  detail::StyleJson::ReadScratch scratch;
  detail::StyleJson::Read<detail::TreeAccess>(*this, sheet, object, scratch);
}

Style* Style::Deserialize(const StyleSheet& sheet, const Json::Object& object,
                          const PropertyKey& category) {
  std::unique_ptr<Style> style(new Style(nullptr, category));
  style->DeserializeJson(sheet, object);
  return style.release();
}

} // namespace Styles
