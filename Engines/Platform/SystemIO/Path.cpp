#include <SystemIO/Path.h>

#include <string>

namespace SystemIO {

ZelStringT<char16_t> Path::Combine(const ZelStringT<char16_t>& folder,
                                   const ZelStringT<char16_t>& name) {
  if (folder.IsEmpty() || (!name.IsEmpty() && name[0] == u'/'))
    return name;
  if (name.IsEmpty())
    return folder;
  std::u16string path;
  path.reserve(folder.GetLength() + 1 + name.GetLength());
  path.append(folder.GetView());
  if (path.back() != u'/')
    path.push_back(u'/');
  path.append(name.GetView());
  return ZelStringT<char16_t>(std::move(path));
}

} // namespace SystemIO
