/// @file
/// The style sheet: a named collection of styles that owns the styles put into
/// it, finds them by a case-insensitive name and by pointer, keeps a format
/// version and an external ID, repairs references when styles are deleted, and
/// is written to and read from one JSON document (text or stream).
#pragma once

#include <Styles/Export.h>
#include <Styles/Style.h>

#include <ZelPlatform/ZelString.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/String.h>

#include <map>
#include <memory>
#include <string_view>
#include <vector>

namespace Styles {

namespace detail {
class DocumentReader;
class DocumentWriter;
class ParentForest;
class StyleIndex;
class StyleJson;
} // namespace detail

/// Told about every style that StyleSheet::CopyContentsFrom creates.
class STYLES_API IStyleSheetDuplicationContext {
public:
  /// Called once per style of the copy, in name order; `style` belongs to the
  /// sheet. The sheet always passes 0 as `reserved` and ignores the result.
  /// Declared first: hosts rely on it being the first virtual slot.
  virtual bool OnStyleDuplicated(Style* style, int reserved) = 0;
  virtual ~IStyleSheetDuplicationContext();
};

/// A collection of named styles that it owns; see the file overview.
///
/// Names are compared ignoring letter case, and with every unpaired surrogate
/// taken as U+FFFD, the character a document writes in its place: two names
/// that would be written alike are one name, so a sheet never holds styles
/// whose names collide when its document is read back.
///
/// No style of the sheet is ever left pointing at a style the sheet destroys:
/// where a style leaves the sheet by replacement or a name clash, the styles
/// that referred to it are repaired (see AddStyle and ImportJson). Styles
/// outside the sheet that refer to its styles are the caller's to repair.
class STYLES_API StyleSheet {
public:
  /// Style names ordered ignoring letter case; two names differing only in
  /// case are the same key.
  using NameIndex =
      std::map<ZelStringT<char16_t>, Style*, ZelUtils::String::LessThanCaseInsensitive>;
  /// Styles of one category by name, ordered ignoring letter case.
  using CategoryStyleMap = std::map<PropertyKey, NameIndex>;

  /// An empty sheet of the manager's current version, without external ID.
  StyleSheet();
  StyleSheet(const StyleSheet&) = delete;
  StyleSheet& operator=(const StyleSheet&) = delete;

  /// Destroys every style of the sheet.
  virtual ~StyleSheet();
  /// A copy of the identifier of the external source the sheet stands for.
  virtual ZelStringT<char16_t> GetExternalID() const;
  /// Replaces `text` with the JSON document of the sheet; temporary properties
  /// are written only with `includeTemporary`.
  virtual void ExportToString(ZelStringT<char16_t>& text, bool includeTemporary) const;
  /// Parses `text` and imports it (see ImportJson). False, with the sheet
  /// unchanged, when the text is not JSON or not a JSON object; exceptions
  /// thrown while importing pass through.
  virtual bool ImportFromString(const ZelStringT<char16_t>& text, bool replace);
  /// Adds the document's members to the Json::Object that `out` already holds
  /// (std::bad_cast when it holds something else).
  virtual void ExportJson(JsonValue& out, bool includeTemporary) const;
  /// Adds the styles of `document` (not owned) to the sheet; `replace` decides
  /// who wins a name clash, as in AddStyle. Sets the version from the document
  /// (0 when it has none) and takes the document's "id" only when the sheet
  /// already has an external ID. Returns true. Throws std::bad_cast for a
  /// style member that is not an object; behaviour exceptions pass through.
  /// A style of the sheet replaced by the document is destroyed, and every
  /// style that referred to it refers to the document's style of that name
  /// instead. An "inherits" that would close a parent cycle is ignored (the
  /// style keeps its parent); time and stack stay linear in the document
  /// whatever the length of its inheritance chains.
  virtual bool ImportJson(Json::Object* document, bool replace);
  /// Sets the identifier GetExternalID returns; an import takes the
  /// document's "id" only once the sheet has one.
  virtual void SetExternalID(const ZelStringT<char16_t>& id);

  ///@{

  /// The document version: written with the sheet and set by an import.
  /// The stock behaviours leave out properties newer than it.
  int GetVersion() const noexcept { return m_version; }
  void SetVersion(int version) noexcept { m_version = version; }
  ///@}

  /// Destroys every style (in name order), empties the sheet and resets the
  /// version to the manager's current version. The external ID stays. Every
  /// style of the sheet goes, so none is left pointing at another.
  void Clear();

  /// Files `style` under `name`; the sheet takes ownership of `style` in every
  /// case. With `replace`, a style already filed under `name` (in any letter
  /// case) is detached and returned: the caller owns it and should destroy it;
  /// the sheet's styles that referred to it now refer to `style` (one that
  /// `style` itself inherits from takes over the old style's values instead,
  /// so that no parent cycle arises). Without `replace`, a clash destroys
  /// `style` and keeps the existing one; styles that referred to `style` refer
  /// to the existing one. Returns null when nothing was replaced. The name is
  /// taken as it is, even empty. A style the sheet already holds is never
  /// destroyed nor listed twice: offered under its own name it stays (re-spelled
  /// with `replace`); under another name it moves to the new one.
  Style* AddStyle(const ZelStringT<char16_t>& name, Style* style, bool replace);
  /// Detaches the style filed under `name` and returns it (the caller owns it
  /// from now on), or null. Styles that refer to it are not repaired.
  Style* RemoveStyle(const ZelStringT<char16_t>& name);
  /// Detaches `style`; the caller, holding the pointer, owns it. False when it
  /// is null or not in the sheet.
  bool RemoveStyle(Style* style);
  /// Makes every style of the sheet drop its references to the styles of
  /// `styles`, then destroys those of them that belong to the sheet. Null and
  /// foreign pointers are skipped (foreign styles are not destroyed).
  void DeleteStyles(StyleSpan styles);
  /// Files the style called `oldName` under `newName`. Does nothing when no
  /// style is called `oldName`, or when another style is already called
  /// `newName`; a change of letter case only re-spells the name.
  void RenameStyle(const ZelStringT<char16_t>& oldName, const ZelStringT<char16_t>& newName);
  /// Offers each of this sheet's own styles back to this sheet's AddStyle
  /// under its own name and destroys what AddStyle returns, then forgets the
  /// names of `other`'s styles. Kept as it always behaved, which hosts must
  /// know: `other`'s styles are not moved here. Since AddStyle keeps a style
  /// already filed under its own name, this sheet ends as it was. `other`'s
  /// styles stay owned by `other`, which destroys them when it is cleared or
  /// destroyed; GetStyleName and RemoveStyle(Style*) still know them, but
  /// GetStyle and the lists no longer do.
  void MergeIn(StyleSheet& other, bool replace);

  /// @name Queries
  /// Styles returned stay owned by the sheet.
  ///@{

  /// The style filed under `name` in any letter case, or null.
  Style* GetStyle(const ZelStringT<char16_t>& name) const;
  /// Every style, in name order.
  std::vector<Style*> GetStyles() const;
  /// The styles of `names`, in that order; unknown names are skipped.
  std::vector<Style*> GetStylesByName(const std::vector<ZelStringT<char16_t>>& names) const;
  /// The styles of `category`, in name order.
  std::vector<Style*> GetStylesByCategory(const PropertyKey& category) const;
  /// The name `style` is filed under; empty when it is null or not in the sheet.
  ZelStringT<char16_t> GetStyleName(const Style* style) const;
  /// Every name as stored, in name order.
  std::vector<ZelStringT<char16_t>> GetStyleNames() const;
  /// The names of the styles of `category`, in name order.
  std::vector<ZelStringT<char16_t>> GetStyleNames(const PropertyKey& category) const;
  /// The styles whose parent is exactly `parent`; empty for null.
  NameIndex GetChildStyles(const Style* parent) const;
  /// Empties `out`, then files every style under its category (the empty key
  /// for a style without one).
  void GenerateCategoryStyleMap(CategoryStyleMap& out) const;
  /// Appends to `out`, in name order, every style of the sheet that depends on
  /// a style of `styles` (through its whole parent chain).
  void GetDependencies(StyleSpan styles, std::vector<Style*>& out) const;
  /// The first style, in name order, with exactly this external ID and
  /// external name; null when either is empty or none matches.
  Style* GetExternalStyleAlias(const ZelStringT<char16_t>& externalID,
                               const ZelStringT<char16_t>& externalName) const;
  ///@}

  /// `proposed` when no style has that name, else a numbered variant of it. A
  /// registered category's name is first turned into its UI name plus " 1".
  ZelStringT<char16_t> GetUnusedStyleName(const ZelStringT<char16_t>& proposed) const;
  /// Makes this sheet a deep copy of `source` by way of its JSON text, tells
  /// `context` (not owned; may be null) about every new style and takes the
  /// source's version. This sheet's styles are destroyed first, all of them
  /// (as by Clear), so none is left pointing at another.
  void CopyContentsFrom(const StyleSheet& source, IStyleSheetDuplicationContext* context);

  /// Writes the document text (without temporary properties) as UTF-8; false
  /// when the stream refuses the text.
  bool Export(ZelUtils::Stream& stream) const;
  /// Reads the whole stream as UTF-8 text and imports it; ImportFromString's
  /// result.
  bool Import(ZelUtils::Stream& stream, bool replace);

private:
  // The document reader and writer, and one style's JSON, work on the index.
  friend class detail::DocumentReader;
  friend class detail::DocumentWriter;
  friend class detail::StyleJson;

  // Makes every style of the sheet that refers to an old style of `heirs`
  // (styles no longer in the sheet) refer to its heir instead; a style that
  // an heir is or inherits from, or every one when an heir is null, takes
  // over the old style's values instead.
  void Redirect(const std::map<Style*, Style*>& heirs);
  // The style filed under `name` in any letter case, or null.
  Style* FindStyle(std::u16string_view name) const;
  // The name `style` is filed under, not copied; empty when it is not filed.
  std::u16string_view FindStyleName(const Style* style) const;
  // Whether `child` may inherit from `parent`: false when `child` is `parent`
  // or one of its ancestors. During an import the answer takes amortised
  // logarithmic time and the new link is recorded.
  bool AcceptParent(Style& child, Style& parent) const;

  // The styles by name, in name order and by pointer.
  std::unique_ptr<detail::StyleIndex> m_index;
  // The parent links of the import under way, or null.
  mutable detail::ParentForest* m_import = nullptr;
  int m_version;
  ZelStringT<char16_t> m_externalID;
};

} // namespace Styles
