// A Json::Value tree read through the interface of Json::Document::Ref, so
// that the toolkit's readers of documents are written once for both forms.
#pragma once

#include <Json/Json.h>

#include <cstddef>
#include <string_view>

namespace Styles {
namespace Tools {
namespace detail {

// A value of a Json::Value tree, read through the interface of
// Json::Document::Ref, so that one validator reads both forms.
class TreeRef {
public:
  explicit TreeRef(const Json::Object& object) noexcept : m_value(nullptr), m_object(&object) {}
  explicit TreeRef(const Json::Value& value)
      : m_value(&value), m_object(value.GetIf<Json::Object>()) {}

  bool IsNull() const { return m_value && m_value->IsNull(); }
  bool IsString() const { return m_value && m_value->Is<ZelStringT<char16_t>>(); }
  bool IsNumber() const { return m_value && m_value->Is<double>(); }
  bool IsBool() const { return m_value && m_value->Is<bool>(); }
  bool IsObject() const { return m_object != nullptr; }
  bool IsArray() const { return m_value && m_value->Is<Json::Array>(); }
  std::u16string_view GetString() const { return m_value->Get<ZelStringT<char16_t>>().GetView(); }
  double GetNumber() const { return m_value->Get<double>(); }
  bool GetBool() const { return m_value->Get<bool>(); }
  std::size_t GetSize() const {
    return m_object ? m_object->GetSize() : m_value->Get<Json::Array>().GetSize();
  }
  std::u16string_view GetMemberName(std::size_t i) const {
    return m_object->GetValueName(i).GetView();
  }
  TreeRef GetMember(std::size_t i) const { return TreeRef(m_object->GetValue(i)); }
  TreeRef GetElement(std::size_t i) const {
    return TreeRef(m_value->Get<Json::Array>().GetValue(i));
  }

private:
  const Json::Value* m_value; // null for a root object
  const Json::Object* m_object;
};

} // namespace detail
} // namespace Tools
} // namespace Styles
