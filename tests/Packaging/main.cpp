// The README's first example, and a schema of the toolkit validating a
// document; exits non-zero when either does not give what the README says.
#include <Styles/Styles.h>
#include <StylesTools/Diagnostics.h>
#include <StylesTools/Schema.h>

#include <cstdio>

using namespace Styles;
using ZelUtils::Any;

bool IsNumber(const Any& value) { return value.IsTypeCompatible<double>(); }

int main() {
  const PropertyKey paragraph(u"paragraph");
  const PropertyKey fontSize(u"fontSize");

  StyleManager& manager = GetStyleManager();
  manager.SetCurrentVersion(1);
  manager.RegisterCategory(paragraph, u"Paragraph", false, false);
  manager.RegisterProperty(paragraph, fontSize,
                           new StyleProperty(Any(10.0), new ZelPref::NumberConversionPolicy(),
                                             &IsNumber));

  Style body(nullptr, paragraph);
  Style heading(&body, paragraph);
  body.SetProperty(fontSize, Any(11.0));
  const double size = heading.GetProperty(fontSize).Get<double>();
  const PropertyPath path = SplitPath(u"border.width");

  StyleSheet sheet;
  sheet.AddStyle(u"Body", new Style(body), false);
  ZelStringT<char16_t> json;
  sheet.ExportToString(json, false);

  Tools::Schema schema;
  Tools::SchemaRegistration registration;
  Tools::SchemaError error;
  const bool registered =
      Tools::ParseSchema(u"{\"categories\": [{\"key\": \"note\", \"properties\": "
                         u"[{\"key\": \"size\", \"type\": \"number\", \"minimum\": 1}]}]}",
                         schema, error) &&
      Tools::RegisterSchema(schema, registration, error);
  const bool checked =
      registered &&
      Tools::ValidateDocument(u"{\"note\": {\"N\": {\"size\": \"0\"}}}").size() == 1;
  Tools::DeregisterSchema(registration);

  const bool ok = size == 11.0 && path.size() == 2 && checked &&
                  json == u"{\"version\":1,\"paragraph\":{\"Body\":{\"fontSize\":\"11\"}}}";
  std::puts(ok ? "consumer: ok" : "consumer: unexpected result");
  return ok ? 0 : 1;
}
