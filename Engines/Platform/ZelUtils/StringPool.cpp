#include <ZelUtils/StringPool.h>

#include <mutex>

namespace ZelUtils {

StringPool::StringPool() {
  m_index.max_load_factor(1.0f);
  m_empty = AddString(std::u16string_view());
}

StringPool::~StringPool() = default;

const StringPool::Entry* StringPool::AddString(std::u16string_view text) {
  {
    std::shared_lock<std::shared_mutex> lock(m_mutex);
    auto found = m_index.find(text);
    if (found != m_index.end())
      return found->second;
  }
  std::unique_lock<std::shared_mutex> lock(m_mutex);
  auto found = m_index.find(text); // another thread may have added it meanwhile
  if (found != m_index.end())
    return found->second;
  const Entry& entry = m_entries.emplace_back(text);
  m_index.emplace(entry.GetView(), &entry);
  return &entry;
}

const StringPool::Entry* StringPool::FindString(std::u16string_view text) const {
  std::shared_lock<std::shared_mutex> lock(m_mutex);
  const auto found = m_index.find(text);
  return found == m_index.end() ? nullptr : found->second;
}

std::size_t StringPool::GetSize() const {
  std::shared_lock<std::shared_mutex> lock(m_mutex);
  return m_entries.size();
}

} // namespace ZelUtils
