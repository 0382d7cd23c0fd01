#include <StylesTools/Rewrite.h>

#include <Styles/Style.h>
#include <Styles/StyleSheet.h>

#include <Json/Json.h>

#include <string>
#include <vector>

namespace Styles {
namespace Tools {

namespace {

// Rewrites each substyle member of `object`, the JSON object of `style`, with
// its temporary values, and so on down: the library's substyle behaviours
// write substyles without them.
void AddNestedTemporaries(const StyleSheet& sheet, const Style& style, Json::Object& object) {
  for (const auto& [key, value] : style.GetProperties()) {
    Json::Value* member = object.Find(key.GetString().GetView());
    if (!member)
      continue; // not written: a value newer than the sheet, or with no text form
    if (Style* const* substyle = value.GetIf<Style*>()) {
      if (*substyle && member->Is<Json::Object>())
        SerializeComplete(sheet, **substyle, *member);
    } else if (const auto* list = value.GetIf<std::vector<Style*>>()) {
      Json::Array* array = member->GetIf<Json::Array>();
      std::size_t index = 0; // the array holds the non-null substyles only
      for (const Style* element : *list)
        if (element && array && index < array->GetSize())
          SerializeComplete(sheet, *element, array->GetValue(index++));
    }
  }
}

} // namespace

void ExportComplete(const StyleSheet& sheet, Json::Value& out) {
  out = Json::Value(Json::Object());
  sheet.ExportJson(out, true);
  for (Json::Member& category : out.Get<Json::Object>()) {
    Json::Object* styles = category.value.GetIf<Json::Object>();
    if (!styles)
      continue; // the version and the id
    for (Json::Member& entry : *styles) {
      const Style* style = sheet.GetStyle(entry.name);
      if (style && entry.value.Is<Json::Object>())
        AddNestedTemporaries(sheet, *style, entry.value.Get<Json::Object>());
    }
  }
}

void SerializeComplete(const StyleSheet& sheet, const Style& style, Json::Value& out) {
  style.Serialize(sheet, out, true);
  AddNestedTemporaries(sheet, style, out.Get<Json::Object>());
}

bool LosesContent(const Diagnostic& diagnostic) {
  static const char* const kLosing[] = {
      "unknown-category", "unknown-property", "unknown-member", "property-too-new",
      "value-replaced",   "number-rounded",   "name-taken",     "duplicate-member"};
  for (const char* code : kLosing)
    if (diagnostic.code == code)
      return true;
  return false;
}

} // namespace Tools
} // namespace Styles
