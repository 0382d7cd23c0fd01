#include <Styles/StyleProperty.h>

#include <Styles/StyleSheet.h>

#include <Json/Json.h>
#include <ZelPref/ConversionPolicy.h>

#include <cassert>
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
  ZelStringT<char16_t> text;
  if (const auto* string = in.GetIf<ZelStringT<char16_t>>())
    text = *string;
  else if (const double* number = in.GetIf<double>())
    text = ZelStringT<char16_t>::FormatInternal("%g", *number);
  else if (const bool* flag = in.GetIf<bool>())
    text = *flag ? u"1" : u"0";
  else
    return false;

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

} // namespace Styles
