#include <Styles/StyleProperty.h>

#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <algorithm>
#include <cassert>
#include <functional>
#include <memory>
#include <utility>

namespace Styles {

PropertyValidator::~PropertyValidator() = default;

// BaseStyleProperty

BaseStyleProperty::BaseStyleProperty(ZelUtils::Any defaultValue, int minimumVersion)
    : m_defaultValue(std::move(defaultValue)), m_minimumVersion(minimumVersion) {}

BaseStyleProperty::~BaseStyleProperty() { delete m_validator; }

PropertyKey BaseStyleProperty::GetElementCategoryName() const { return PropertyKey::Empty; }

bool BaseStyleProperty::NeedAdjustementsForStyleIO() const { return false; }

void BaseStyleProperty::AdjustAfterDeserialize(const StyleSheet&, Style*) const {}

ZelPref::ConversionPolicy* BaseStyleProperty::GetConversionPolicy() const { return nullptr; }

void BaseStyleProperty::DestroyPropertyData(const ZelUtils::Any&) const {}

ZelUtils::Any BaseStyleProperty::MovePropertyData(Style*, ZelUtils::Any&& value) const {
  return std::move(value);
}

std::vector<Style*> BaseStyleProperty::GetDependencies(const ZelUtils::Any&, StyleSpan,
                                                       bool) const {
  return {};
}

bool BaseStyleProperty::HasDependency(const ZelUtils::Any&, StyleSpan, bool) const { return false; }

void BaseStyleProperty::RemoveDependency(ZelUtils::Any&, StyleSpan, bool) const {}

bool BaseStyleProperty::HasParentalDependency(const ZelUtils::Any&) const { return false; }

void BaseStyleProperty::RemoveAllDependencies(ZelUtils::Any&) const {}

void BaseStyleProperty::RemapDependency(ZelUtils::Any&, const std::map<Style*, Style*>&) const {}

void BaseStyleProperty::RemapPointer(
    ZelUtils::Any&, const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>&) const {}

void BaseStyleProperty::SetOwner(ZelUtils::Any&, Style*, const PropertyKey&) const {}

bool BaseStyleProperty::ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn,
                                        Style* style, const PropertyKey& key) const {
  return fn(value, style, key);
}

void BaseStyleProperty::MergeProperty(Style* target, const Style* source, const PropertyKey& key,
                                      bool overwrite) const {
  assert(target && source);
  if (!overwrite && target->DoesOverrideProperty(key))
    return;
  // The copying SetProperty copes with a value that lives in the target.
  target->SetProperty(key, source->GetProperty(key));
}

void BaseStyleProperty::MergeParentProperty(Style* target, const Style* parent,
                                            const PropertyKey& key) const {
  assert(target && parent);
  if (target->DoesOverrideProperty(key))
    return;
  ZelUtils::Any value;
  if (parent->GetProperty(key, value))
    target->SetProperty(key, std::move(value));
}

bool BaseStyleProperty::FlattenProperty(Style* style, const PropertyKey& key) const {
  assert(style);
  ZelUtils::Any value;
  if (!style->GetProperty(key, value))
    return false;
  style->SetProperty(key, std::move(value));
  return true;
}

bool BaseStyleProperty::IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  return a == b;
}

bool BaseStyleProperty::IsDeprecated() const { return false; }

bool BaseStyleProperty::IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  return a < b;
}

bool BaseStyleProperty::ProcessStylesInProperty(const ZelUtils::Any&, const StyleVisitor&) const {
  return false;
}

bool BaseStyleProperty::IsTemporary() const { return false; }

bool BaseStyleProperty::IsSubstyle() const { return false; }

void BaseStyleProperty::SetName(const PropertyKey& categoryKey, const PropertyKey& name) {
  m_categoryKey = categoryKey;
  m_name = name;
}

void BaseStyleProperty::SetValidator(PropertyValidator* validator) {
  if (validator == m_validator)
    return;
  delete m_validator;
  m_validator = validator;
}

bool BaseStyleProperty::Validate(ZelUtils::Any& value) const {
  return m_validator && m_validator->Validate(value, m_defaultValue);
}

// StyleProperty

namespace {

// The names whose unreadable values are repaired rather than reported.
bool IsScaleName(const ZelStringT<char16_t>& name) {
  return name.Compare(u"xScale", kCompareCaseSensitive) == 0 ||
         name.Compare(u"yScale", kCompareCaseSensitive) == 0;
}

bool IsAngleName(const ZelStringT<char16_t>& name) {
  return name.Compare(u"angle", kCompareCaseSensitive) == 0 ||
         name.Compare(u"skew", kCompareCaseSensitive) == 0;
}

} // namespace

StyleProperty::StyleProperty(ZelUtils::Any defaultValue, ZelPref::ConversionPolicy* policy,
                             TypeCheck typeCheck, int minimumVersion)
    : BaseStyleProperty(std::move(defaultValue), minimumVersion), m_policy(policy),
      m_typeCheck(typeCheck) {}

StyleProperty::~StyleProperty() { delete m_policy; }

bool StyleProperty::Serialize(const StyleSheet& sheet, const Style*, const ZelUtils::Any& value,
                              JsonValue& out) const {
  if (sheet.GetVersion() < GetMinimumVersion())
    return false;
  out = JsonValue();
  if (m_policy)
    out = JsonValue(m_policy->ToText(value));
  return true;
}

bool StyleProperty::Deserialize(const StyleSheet&, Style* style, const JsonValue& in) const {
  assert(style);
  if (!m_policy)
    return false;
  // A string value is read where it is; numbers and flags become text first.
  ZelStringT<char16_t> converted;
  const ZelStringT<char16_t>* string = in.GetIf<ZelStringT<char16_t>>();
  if (const double* number = string ? nullptr : in.GetIf<double>())
    converted = ZelStringT<char16_t>::FormatInternal("%g", *number);
  else if (const bool* flag = string ? nullptr : in.GetIf<bool>())
    converted = *flag ? u"1" : u"0";
  else if (!string)
    return false;
  const ZelStringT<char16_t>& text = string ? *string : converted;

  try {
    style->SetProperty(GetName(), m_policy->FromText(text));
  } catch (const ZelPref::Detail::BadConversion&) {
    // Unreadable scale factors become 1 and unreadable angles 0, so that old
    // documents still load; every other name reports the failure.
    const ZelStringT<char16_t>& name = GetName().GetString();
    if (IsScaleName(name))
      style->SetProperty(GetName(), ZelUtils::Any(1.0));
    else if (IsAngleName(name))
      style->SetProperty(GetName(), ZelUtils::Any(0.0));
    else
      throw;
  }
  return true;
}

ZelPref::ConversionPolicy* StyleProperty::GetConversionPolicy() const { return m_policy; }

bool StyleProperty::CheckType(const ZelUtils::Any& value) const {
  return m_typeCheck && m_typeCheck(value);
}

namespace {

// The substyle of a single-substyle value; std::bad_cast unless it holds Style*.
Style* HeldSubstyle(const ZelUtils::Any& value) { return value.Get<Style*>(); }

// The substyles of an array value; std::bad_cast for any other kind.
const std::vector<Style*>& HeldList(const ZelUtils::Any& value) {
  return value.Get<std::vector<Style*>>();
}

} // namespace

// StyleSetProperty

StyleSetProperty::StyleSetProperty(const PropertyKey& elementCategory)
    : BaseStyleProperty(ZelUtils::Any(static_cast<Style*>(nullptr))),
      m_elementCategory(elementCategory) {}

StyleSetProperty::~StyleSetProperty() { delete HeldSubstyle(GetDefaultValue()); }

PropertyKey StyleSetProperty::GetElementCategoryName() const { return m_elementCategory; }

bool StyleSetProperty::Serialize(const StyleSheet& sheet, const Style*, const ZelUtils::Any& value,
                                 JsonValue& out) const {
  if (sheet.GetVersion() < GetMinimumVersion())
    return false;
  out = JsonValue();
  if (const Style* substyle = HeldSubstyle(value))
    substyle->Serialize(sheet, out, false);
  return true;
}

bool StyleSetProperty::Deserialize(const StyleSheet& sheet, Style* style,
                                   const JsonValue& in) const {
  const Json::Object* object = in.GetIf<Json::Object>();
  if (!style || !object)
    return false;
  std::unique_ptr<Style> substyle(Style::Deserialize(sheet, *object, m_elementCategory));
  substyle->SetOwner(style, GetName());
  // Adopted as it is. An own value already there (a repeated member) stays,
  // and the substyle that nobody then holds is freed here.
  if (style->m_properties.Insert(GetName(), ZelUtils::Any(substyle.get())))
    substyle.release();
  return true;
}

void StyleSetProperty::DestroyPropertyData(const ZelUtils::Any& value) const {
  delete HeldSubstyle(value);
}

ZelUtils::Any StyleSetProperty::MovePropertyData(Style* owner, ZelUtils::Any&& value) const {
  const Style* source =
      value.IsTypeCompatible<Style*>() ? value.Get<Style*>() : value.Get<const Style*>();
  if (!source)
    return ZelUtils::Any();
  Style* copy = new Style(*source);
  copy->SetOwner(owner, GetName());
  return ZelUtils::Any(copy);
}

std::vector<Style*> StyleSetProperty::GetDependencies(const ZelUtils::Any& value, StyleSpan styles,
                                                      bool parentOnly) const {
  const Style* substyle = HeldSubstyle(value);
  if (!substyle)
    return {};
  if (!parentOnly)
    return substyle->GetDependencies(styles, false);
  Style* parent = substyle->GetParent();
  if (parent && styles.contains(parent))
    return {parent};
  return {};
}

bool StyleSetProperty::HasDependency(const ZelUtils::Any& value, StyleSpan styles,
                                     bool parentOnly) const {
  const Style* substyle = HeldSubstyle(value);
  if (!substyle)
    return false;
  if (parentOnly)
    return substyle->GetParent() && styles.contains(substyle->GetParent());
  return styles.contains(substyle) || substyle->HasDependency(styles, false);
}

void StyleSetProperty::RemoveDependency(ZelUtils::Any& value, StyleSpan styles,
                                        bool parentOnly) const {
  if (Style* substyle = HeldSubstyle(value))
    substyle->RemoveDependency(styles, parentOnly);
}

bool StyleSetProperty::HasParentalDependency(const ZelUtils::Any& value) const {
  const Style* substyle = HeldSubstyle(value);
  return substyle && substyle->HasParentalDependency();
}

void StyleSetProperty::RemoveAllDependencies(ZelUtils::Any& value) const {
  if (Style* substyle = HeldSubstyle(value))
    substyle->RemoveAllDependencies();
}

void StyleSetProperty::RemapDependency(ZelUtils::Any& value,
                                       const std::map<Style*, Style*>& map) const {
  if (Style* substyle = HeldSubstyle(value))
    substyle->RemapDependency(map);
}

void StyleSetProperty::RemapPointer(
    ZelUtils::Any& value, const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) const {
  if (Style* substyle = HeldSubstyle(value))
    substyle->RemapPointer(pairs);
}

void StyleSetProperty::SetOwner(ZelUtils::Any& value, Style* owner, const PropertyKey& key) const {
  if (Style* substyle = HeldSubstyle(value))
    substyle->SetOwner(owner, key);
}

bool StyleSetProperty::ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn, Style*,
                                       const PropertyKey&) const {
  Style* substyle = HeldSubstyle(value);
  return !substyle || substyle->ProcessProperties(fn);
}

void StyleSetProperty::MergeProperty(Style* target, const Style* source, const PropertyKey& key,
                                     bool overwrite) const {
  assert(target && source);
  const Style* sourceSubstyle = source->GetSubstyle(key, false);
  if (target->DoesOverrideProperty(key)) {
    Style* own = target->GetSubstyle(key, false);
    if (own && sourceSubstyle)
      own->MergeProperties(sourceSubstyle, overwrite);
    return;
  }
  target->SetProperty(key, ZelUtils::Any(sourceSubstyle));
}

void StyleSetProperty::MergeParentProperty(Style* target, const Style* parent,
                                           const PropertyKey& key) const {
  assert(target && parent);
  const Style* parentSubstyle = parent->GetSubstyle(key, false);
  if (target->DoesOverrideProperty(key)) {
    // An own substyle with a parent of its own already inherits elsewhere.
    Style* own = target->GetSubstyle(key, false);
    if (own && !own->GetParent() && parentSubstyle) {
      own->MergeParentProperties(parentSubstyle);
      own->SetParent(parentSubstyle->GetParent());
    }
    return;
  }
  target->SetProperty(key, ZelUtils::Any(parentSubstyle));
}

bool StyleSetProperty::FlattenProperty(Style* style, const PropertyKey& key) const {
  assert(style);
  if (Style* own = style->GetSubstyle(key, false))
    return own->Flatten();
  if (!style->GetSubstyle(key, true))
    return false;
  {
    const Style empty(nullptr, m_elementCategory);
    style->SetProperty(key, ZelUtils::Any(&empty));
  }
  Style* created = style->GetSubstyle(key, false);
  return created && created->Flatten();
}

bool StyleSetProperty::IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  const Style* x = HeldSubstyle(a);
  const Style* y = HeldSubstyle(b);
  return x == y || (x && y && *x == *y);
}

bool StyleSetProperty::IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  const Style* x = HeldSubstyle(a);
  const Style* y = HeldSubstyle(b);
  if (x == y)
    return false;
  if (x && y)
    return *x < *y;
  return std::less<const Style*>()(x, y);
}

bool StyleSetProperty::ProcessStylesInProperty(const ZelUtils::Any& value,
                                               const StyleVisitor& fn) const {
  return fn(HeldSubstyle(value));
}

bool StyleSetProperty::CheckType(const ZelUtils::Any& value) const {
  return value.IsTypeCompatible<const Style*>();
}

bool StyleSetProperty::IsSubstyle() const { return true; }

// StyleArrayProperty

StyleArrayProperty::StyleArrayProperty(const PropertyKey& elementCategory)
    : BaseStyleProperty(ZelUtils::Any(std::vector<Style*>())), m_elementCategory(elementCategory) {}

StyleArrayProperty::~StyleArrayProperty() = default;

PropertyKey StyleArrayProperty::GetElementCategoryName() const { return m_elementCategory; }

bool StyleArrayProperty::Serialize(const StyleSheet& sheet, const Style*,
                                   const ZelUtils::Any& value, JsonValue& out) const {
  if (sheet.GetVersion() < GetMinimumVersion())
    return false;
  const std::vector<Style*>& substyles = HeldList(value);
  Json::Array& array = out.Emplace<Json::Array>();
  array.Reserve(substyles.size());
  for (const Style* substyle : substyles) {
    if (!substyle)
      continue;
    JsonValue element;
    substyle->Serialize(sheet, element, false);
    array.AddValue(std::move(element));
  }
  return true;
}

bool StyleArrayProperty::Deserialize(const StyleSheet& sheet, Style* style,
                                     const JsonValue& in) const {
  const Json::Array* array = in.GetIf<Json::Array>();
  if (!style || !array)
    return false;
  const PropertyKey& category =
      m_elementCategory == PropertyKey::Empty ? GetCategoryKey() : m_elementCategory;
  std::vector<std::unique_ptr<Style>> read;
  read.reserve(array->GetSize());
  for (const JsonValue& element : *array)
    if (const Json::Object* object = element.GetIf<Json::Object>())
      read.emplace_back(Style::Deserialize(sheet, *object, category));
  std::vector<Style*> list;
  list.reserve(read.size());
  for (const std::unique_ptr<Style>& substyle : read)
    list.push_back(substyle.get());
  // The style stores copies; the substyles read here are freed with `read`.
  style->SetProperty(GetName(), std::move(list));
  return true;
}

void StyleArrayProperty::DestroyPropertyData(const ZelUtils::Any& value) const {
  for (Style* substyle : HeldList(value))
    delete substyle;
}

ZelUtils::Any StyleArrayProperty::MovePropertyData(Style*, ZelUtils::Any&& value) const {
  const std::vector<Style*>& source = HeldList(value);
  std::vector<Style*> copies;
  copies.reserve(source.size());
  try {
    for (const Style* substyle : source)
      copies.push_back(substyle ? new Style(*substyle) : nullptr);
  } catch (...) {
    for (Style* copy : copies)
      delete copy;
    throw;
  }
  return ZelUtils::Any(std::move(copies));
}

std::vector<Style*> StyleArrayProperty::GetDependencies(const ZelUtils::Any& value,
                                                        StyleSpan styles, bool parentOnly) const {
  std::vector<Style*> sortedStyles;
  if (!styles.is_sorted()) {
    sortedStyles.assign(styles.begin(), styles.end());
    std::sort(sortedStyles.begin(), sortedStyles.end(), std::less<>());
    styles = StyleSpan(sortedStyles, true);
  }
  std::vector<Style*> result;
  if (parentOnly) {
    // The substyles themselves, on purpose: HasDependency looks at parents.
    std::vector<Style*> substyles = HeldList(value);
    std::sort(substyles.begin(), substyles.end(), std::less<>());
    for (Style* substyle : substyles)
      if (substyle && styles.contains(substyle))
        result.push_back(substyle);
  } else {
    for (const Style* substyle : HeldList(value)) {
      if (!substyle)
        continue;
      const std::vector<Style*> held = substyle->GetDependencies(styles, false);
      result.insert(result.end(), held.begin(), held.end());
    }
    std::sort(result.begin(), result.end(), std::less<>());
  }
  result.erase(std::unique(result.begin(), result.end()), result.end());
  return result;
}

bool StyleArrayProperty::HasDependency(const ZelUtils::Any& value, StyleSpan styles,
                                       bool parentOnly) const {
  for (const Style* substyle : HeldList(value)) {
    if (!substyle)
      continue;
    if (parentOnly ? substyle->GetParent() && styles.contains(substyle->GetParent())
                   : styles.contains(substyle) || substyle->HasDependency(styles, false))
      return true;
  }
  return false;
}

void StyleArrayProperty::RemoveDependency(ZelUtils::Any& value, StyleSpan styles,
                                          bool parentOnly) const {
  ProcessStylesInProperty(value, [&](Style* substyle) {
    if (substyle)
      substyle->RemoveDependency(styles, parentOnly);
    return true;
  });
}

bool StyleArrayProperty::HasParentalDependency(const ZelUtils::Any& value) const {
  for (const Style* substyle : HeldList(value))
    if (substyle && substyle->HasParentalDependency())
      return true;
  return false;
}

void StyleArrayProperty::RemoveAllDependencies(ZelUtils::Any& value) const {
  ProcessStylesInProperty(value, [](Style* substyle) {
    if (substyle)
      substyle->RemoveAllDependencies();
    return true;
  });
}

void StyleArrayProperty::RemapDependency(ZelUtils::Any& value,
                                         const std::map<Style*, Style*>& map) const {
  for (Style* substyle : HeldList(value))
    if (substyle)
      substyle->RemapDependency(map);
}

void StyleArrayProperty::RemapPointer(
    ZelUtils::Any& value, const std::vector<std::pair<ZelUtils::Any, ZelUtils::Any>>& pairs) const {
  for (Style* substyle : HeldList(value))
    if (substyle)
      substyle->RemapPointer(pairs);
}

bool StyleArrayProperty::ProcessProperty(ZelUtils::Any& value, const PropertyVisitor& fn, Style*,
                                         const PropertyKey&) const {
  for (Style* substyle : HeldList(value))
    if (substyle && !substyle->ProcessProperties(fn))
      return false;
  return true;
}

bool StyleArrayProperty::FlattenProperty(Style* style, const PropertyKey& key) const {
  assert(style);
  ZelUtils::Any effective;
  if (!style->GetProperty(key, effective))
    return false;
  bool flattened = false;
  std::vector<std::unique_ptr<Style>> copies;
  for (const Style* substyle : HeldList(effective)) {
    copies.emplace_back(substyle ? new Style(*substyle) : nullptr);
    if (substyle)
      flattened = copies.back()->Flatten() || flattened;
  }
  std::vector<Style*> list;
  list.reserve(copies.size());
  for (const std::unique_ptr<Style>& copy : copies)
    list.push_back(copy.get());
  // The style stores copies of these; the flattened ones are freed with `copies`.
  style->SetProperty(key, std::move(list));
  return flattened;
}

bool StyleArrayProperty::IsEqual(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  const std::vector<Style*>& x = HeldList(a);
  const std::vector<Style*>& y = HeldList(b);
  if (x.size() != y.size())
    return false;
  for (std::size_t i = 0; i < x.size(); ++i)
    if (x[i] != y[i] && (!x[i] || !y[i] || *x[i] != *y[i]))
      return false;
  return true;
}

bool StyleArrayProperty::IsLess(const ZelUtils::Any& a, const ZelUtils::Any& b) const {
  const std::vector<Style*>& x = HeldList(a);
  const std::vector<Style*>& y = HeldList(b);
  if (x.size() != y.size())
    return x.size() < y.size();
  for (std::size_t i = 0; i < x.size(); ++i) {
    if (x[i] == y[i])
      continue;
    if (!x[i] || !y[i])
      return std::less<const Style*>()(x[i], y[i]);
    if (*x[i] != *y[i])
      return *x[i] < *y[i];
  }
  return false;
}

bool StyleArrayProperty::ProcessStylesInProperty(const ZelUtils::Any& value,
                                                 const StyleVisitor& fn) const {
  for (Style* substyle : HeldList(value))
    if (!fn(substyle))
      return false;
  return true;
}

bool StyleArrayProperty::CheckType(const ZelUtils::Any& value) const {
  return value.IsTypeCompatible<std::vector<Style*>>();
}

} // namespace Styles
