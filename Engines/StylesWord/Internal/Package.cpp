#include <Internal/Package.h>

#include <Internal/WordMap.h>

#include <pugixml.hpp>
#include <zip.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace Styles {
namespace Word {
namespace detail {

namespace {

Problem MakeProblem(const std::string& part, const std::string& message) {
  return Problem{Widen(part), Text(), Widen(message)};
}

std::string Folder(const std::string& part) {
  const std::size_t slash = part.rfind('/');
  return slash == std::string::npos ? std::string() : part.substr(0, slash + 1);
}

// `target` taken relative to the folder of `source`, with "." and ".." folded.
std::string ResolveTarget(const std::string& source, std::string target) {
  std::string path =
      !target.empty() && target[0] == '/' ? target.substr(1) : Folder(source) + target;
  std::vector<std::string> segments;
  std::size_t start = 0;
  while (start <= path.size()) {
    std::size_t end = path.find('/', start);
    if (end == std::string::npos)
      end = path.size();
    const std::string segment = path.substr(start, end - start);
    if (segment == "..") {
      if (!segments.empty())
        segments.pop_back();
    } else if (!segment.empty() && segment != ".") {
      segments.push_back(segment);
    }
    start = end + 1;
  }
  std::string resolved;
  for (const std::string& segment : segments)
    resolved += (resolved.empty() ? "" : "/") + segment;
  return resolved;
}

// The relationships part of `source` ("" for the package itself).
std::string RelationshipsOf(const std::string& source) {
  const std::size_t slash = source.rfind('/');
  const std::string name = slash == std::string::npos ? source : source.substr(slash + 1);
  return Folder(source) + "_rels/" + name + ".rels";
}

// The target of the first internal relationship of `source` whose type ends in
// `/kind`. Empty when there is none.
std::string FindTarget(const pugi::xml_document& relationships, const std::string& source,
                       const char* kind) {
  const std::string suffix = std::string("/") + kind;
  for (const pugi::xml_node relationship : relationships.document_element().children()) {
    const std::string_view type = relationship.attribute("Type").value();
    if (type.size() < suffix.size() || type.substr(type.size() - suffix.size()) != suffix ||
        std::string_view(relationship.attribute("TargetMode").value()) == "External")
      continue;
    return ResolveTarget(source, relationship.attribute("Target").value());
  }
  return std::string();
}

bool ReadRelationships(const Package& package, const std::string& source, pugi::xml_document& out,
                       Problem& error) {
  const std::string name = RelationshipsOf(source);
  std::string text;
  if (!package.Read(name, text, error))
    return false;
  if (!out.load_buffer(text.data(), text.size(), pugi::parse_default | pugi::parse_doctype)) {
    error = MakeProblem(name, "is not well-formed XML");
    return false;
  }
  for (pugi::xml_node node = out.first_child(); node; node = node.next_sibling())
    if (node.type() == pugi::node_doctype) {
      error = MakeProblem(name, "has a DOCTYPE, which packages never hold");
      return false;
    }
  return true;
}

// Opens an archive over `bytes` without copying them; null with `message` set
// on failure.
zip_t* OpenArchive(std::string_view bytes, int flags, zip_source_t*& source, std::string& message) {
  zip_error_t error;
  zip_error_init(&error);
  // An archive opened for writing frees the buffer it was made from when it
  // commits, so it gets a malloc'd copy of its own.
  void* copy = nullptr;
  if (flags != ZIP_RDONLY && !(flags & ZIP_RDONLY)) {
    copy = std::malloc(bytes.empty() ? 1 : bytes.size());
    if (copy && !bytes.empty())
      std::memcpy(copy, bytes.data(), bytes.size());
  }
  source = zip_source_buffer_create(copy ? copy : bytes.data(), bytes.size(), copy ? 1 : 0, &error);
  if (!source)
    std::free(copy);
  zip_t* archive = source ? zip_open_from_source(source, flags, &error) : nullptr;
  if (!archive) {
    message = std::string("is not a readable ZIP archive (") + zip_error_strerror(&error) + ")";
    if (source)
      zip_source_free(source);
    source = nullptr;
  }
  zip_error_fini(&error);
  return archive;
}

} // namespace

Package::~Package() {
  if (m_archive)
    zip_discard(m_archive);
}

bool Package::Open(std::string_view bytes, const Limits& limits, Problem& error) {
  m_limits = limits;
  zip_source_t* source = nullptr;
  std::string message;
  m_archive = OpenArchive(bytes, ZIP_RDONLY | ZIP_CHECKCONS, source, message);
  if (!m_archive) {
    error = MakeProblem("", "the package " + message);
    return false;
  }
  const zip_int64_t entries = zip_get_num_entries(m_archive, 0);
  if (entries < 0 || static_cast<std::size_t>(entries) > limits.maxEntries) {
    error = MakeProblem("", "the package holds more than " + std::to_string(limits.maxEntries) +
                                " entries");
    return false;
  }
  return true;
}

std::string Package::EntryName(const std::string& name) const {
  const zip_int64_t index = zip_name_locate(m_archive, name.c_str(), ZIP_FL_NOCASE);
  if (index < 0)
    return std::string();
  const char* entry = zip_get_name(m_archive, static_cast<zip_uint64_t>(index), 0);
  return entry ? entry : std::string();
}

std::vector<std::string> Package::Names() const {
  std::vector<std::string> names;
  const zip_int64_t entries = zip_get_num_entries(m_archive, 0);
  for (zip_int64_t i = 0; i < entries; ++i)
    if (const char* name = zip_get_name(m_archive, static_cast<zip_uint64_t>(i), 0))
      names.emplace_back(name);
  return names;
}

bool Package::Has(const std::string& name) const {
  return zip_name_locate(m_archive, name.c_str(), ZIP_FL_NOCASE) >= 0;
}

bool Package::Read(const std::string& name, std::string& out, Problem& error) const {
  const zip_int64_t index = zip_name_locate(m_archive, name.c_str(), ZIP_FL_NOCASE);
  if (index < 0) {
    error = MakeProblem(name, "is missing from the package");
    return false;
  }
  zip_file_t* file = zip_fopen_index(m_archive, static_cast<zip_uint64_t>(index), 0);
  if (!file) {
    error = MakeProblem(name, std::string("cannot be opened (") + zip_strerror(m_archive) + ")");
    return false;
  }
  // Reads in chunks and stops past the limit, whatever size the archive claims.
  out.clear();
  char buffer[65536];
  bool ok = true;
  for (;;) {
    const zip_int64_t got = zip_fread(file, buffer, sizeof buffer);
    if (got < 0) {
      error = MakeProblem(name, std::string("is damaged (") + zip_file_strerror(file) + ")");
      ok = false;
      break;
    }
    if (got == 0)
      break;
    if (out.size() + static_cast<std::size_t>(got) > m_limits.maxPartSize) {
      error = MakeProblem(name, "is larger than " + std::to_string(m_limits.maxPartSize) +
                                    " bytes once uncompressed");
      ok = false;
      break;
    }
    out.append(buffer, static_cast<std::size_t>(got));
  }
  zip_fclose(file);
  return ok;
}

bool FindParts(const Package& package, PackageParts& parts, Problem& error) {
  pugi::xml_document root;
  if (!ReadRelationships(package, "", root, error))
    return false;
  const std::string main = FindTarget(root, "", "officeDocument");
  if (main.empty()) {
    error = MakeProblem("_rels/.rels", "names no main document (officeDocument relationship)");
    return false;
  }
  pugi::xml_document relationships;
  if (!package.Has(RelationshipsOf(main)))
    return true; // a main document without relationships has no styles part
  if (!ReadRelationships(package, main, relationships, error))
    return false;
  parts.styles = FindTarget(relationships, main, "styles");
  parts.theme = FindTarget(relationships, main, "theme");
  return true;
}

bool ReplacePart(std::string_view bytes, const std::string& name, const std::string& data,
                 std::string& out, Problem& error) {
  zip_source_t* source = nullptr;
  std::string message;
  zip_t* archive = OpenArchive(bytes, 0, source, message);
  if (!archive) {
    error = MakeProblem("", "the package " + message);
    return false;
  }
  zip_source_keep(source); // the rewritten archive is read back from it
  const zip_int64_t index = zip_name_locate(archive, name.c_str(), ZIP_FL_NOCASE);
  zip_source_t* part = zip_source_buffer(archive, data.data(), data.size(), 0);
  bool ok = index >= 0 && part &&
            zip_file_replace(archive, static_cast<zip_uint64_t>(index), part, 0) == 0;
  if (!ok && part)
    zip_source_free(part);
  if (ok && zip_close(archive) != 0)
    ok = false;
  if (!ok) {
    error = MakeProblem(name, std::string("cannot be replaced (") + zip_strerror(archive) + ")");
    zip_discard(archive);
    zip_source_free(source);
    return false;
  }
  ok = zip_source_open(source) == 0 && zip_source_seek(source, 0, SEEK_END) == 0;
  const zip_int64_t size = ok ? zip_source_tell(source) : -1;
  if (size >= 0 && zip_source_seek(source, 0, SEEK_SET) == 0) {
    out.resize(static_cast<std::size_t>(size));
    ok = zip_source_read(source, out.data(), static_cast<zip_uint64_t>(size)) == size;
  } else {
    ok = false;
  }
  zip_source_close(source);
  zip_source_free(source);
  if (!ok)
    error = MakeProblem("", "the rewritten package cannot be read back");
  return ok;
}

} // namespace detail
} // namespace Word
} // namespace Styles
