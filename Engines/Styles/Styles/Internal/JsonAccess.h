// Uniform read access to JSON objects held either as a value tree
// (Json::Object) or inside a compact Json::Document, so that one reader of
// sheets and styles serves both. Internal to the library: not installed.
#pragma once

#include <Json/Json.h>

#include <cstddef>
#include <optional>
#include <string_view>
#include <typeinfo>

namespace Styles {
namespace detail {

// Objects and values of a value tree.
struct TreeAccess {
  using Object = Json::Object;
  using Value = const Json::Value*;

  static std::size_t Size(const Object& object) { return object.GetSize(); }
  static std::u16string_view Name(const Object& object, std::size_t i) {
    return object.GetValueName(i).GetView();
  }
  static Value Member(const Object& object, std::size_t i) { return &object.GetValue(i); }
  static const Object* AsObject(Value value) { return value->GetIf<Json::Object>(); }
  // The object a style member must be; std::bad_cast for anything else.
  static const Object& RequireObject(Value value) { return value->Get<Json::Object>(); }
  static std::optional<double> AsNumber(Value value) {
    const double* number = value->GetIf<double>();
    return number ? std::optional<double>(*number) : std::nullopt;
  }
  static std::optional<std::u16string_view> AsString(Value value) {
    const ZelStringT<char16_t>* text = value->GetIf<ZelStringT<char16_t>>();
    return text ? std::optional<std::u16string_view>(text->GetView()) : std::nullopt;
  }
  static std::optional<const Json::Array*> AsArray(Value value) {
    const Json::Array* array = value->GetIf<Json::Array>();
    return array ? std::optional<const Json::Array*>(array) : std::nullopt;
  }
  static std::size_t Size(const Json::Array* array) { return array->GetSize(); }
  static Value Element(const Json::Array* array, std::size_t i) { return &array->GetValue(i); }
  // The value as behaviours take it: the tree's own.
  static const Json::Value& ForBehaviour(Value value, Json::Value&) { return *value; }
};

// Objects and values of a compact document; a behaviour gets each value
// copied into a scratch value whose storage is reused.
struct DocumentAccess {
  using Object = Json::Document::Ref;
  using Value = Json::Document::Ref;

  static std::size_t Size(const Object& object) { return object.GetSize(); }
  static std::u16string_view Name(const Object& object, std::size_t i) {
    return object.GetMemberName(i);
  }
  static Value Member(const Object& object, std::size_t i) { return object.GetMember(i); }
  static std::optional<Object> AsObject(Value value) {
    return value.IsObject() ? std::optional<Object>(value) : std::nullopt;
  }
  static Object RequireObject(Value value) {
    if (!value.IsObject())
      throw std::bad_cast();
    return value;
  }
  static std::optional<double> AsNumber(Value value) {
    return value.IsNumber() ? std::optional<double>(value.GetNumber()) : std::nullopt;
  }
  static std::optional<std::u16string_view> AsString(Value value) {
    return value.IsString() ? std::optional<std::u16string_view>(value.GetString()) : std::nullopt;
  }
  static std::optional<Value> AsArray(Value value) {
    return value.IsArray() ? std::optional<Value>(value) : std::nullopt;
  }
  static Value Element(const Value& array, std::size_t i) { return array.GetElement(i); }
  static const Json::Value& ForBehaviour(Value value, Json::Value& scratch) {
    value.AssignTo(scratch);
    return scratch;
  }
};

} // namespace detail
} // namespace Styles
