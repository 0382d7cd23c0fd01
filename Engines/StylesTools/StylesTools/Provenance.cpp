#include <StylesTools/Provenance.h>

#include <Internal/ToolsSupport.h>
#include <StylesTools/Schema.h>

#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>

#include <ZelPref/ConversionPolicy.h>

#include <exception>
#include <memory>
#include <string>
#include <typeinfo>
#include <vector>

namespace Styles {
namespace Tools {

using detail::Text;
using detail::Widen;

namespace {

Resolution DefaultOf(const StyleCategory* category, const PropertyKey& key, const Style* owner) {
  if (!category)
    throw std::exception();
  return Resolution{&category->GetDefaultValue(key), ValueSource::Default, nullptr, category,
                    owner};
}

// Whether `key` of `category` belongs to each style alone, so that a style
// without its own value has the default rather than a parent's.
bool PerStyle(const StyleCategory* category, const PropertyKey& key) {
  const BaseStyleProperty* behaviour = category ? category->GetStyleProperty(key) : nullptr;
  return behaviour && IsPerStyle(*behaviour);
}

// The effective value of `key`, as Style::GetProperty gives it; through the
// cache when there is one.
const ZelUtils::Any& EffectiveOf(const Style& style, const PropertyKey& key,
                                 ResolutionCache* cache) {
  return cache ? *cache->Resolve(style, key).value : style.GetProperty(key);
}

// Descends from `start` along `keys`, last key first, through effective
// values that must hold substyles; null when one of them is null.
const Style* Descend(const Style* start, const std::vector<PropertyKey>& keys,
                     ResolutionCache* cache) {
  const Style* counterpart = start;
  for (std::size_t i = keys.size(); i-- > 0 && counterpart;) {
    const ZelUtils::Any& value = EffectiveOf(*counterpart, keys[i], cache);
    if (!value.IsTypeCompatible<Style*>())
      throw std::bad_cast();
    counterpart = value.Get<Style*>();
  }
  return counterpart;
}

// The search of Style::GetInheritedProperty from `current`, which has no own
// value to look at; `source` is what a value found on a parent counts as.
Resolution Inherit(const Style* current, const PropertyKey& key, ValueSource source,
                   const Style* owner, ResolutionCache* cache) {
  std::vector<PropertyKey> keys;
  for (;;) {
    while (const Style* parent = current->GetParent()) {
      if (const ZelUtils::Any* own = parent->GetProperties().Find(key))
        return Resolution{own, source, parent, nullptr, owner};
      current = parent;
    }
    if (!current->GetOwner())
      return DefaultOf(current->GetCategory().get(), key, owner);

    // Owner-based inheritance: the first owner with a parent, and the owner
    // keys on the way up.
    keys.clear();
    const Style* climber = current;
    const Style* ownerWithParent = nullptr;
    while (climber->GetOwner()) {
      keys.push_back(climber->GetOwnerPropertyKey());
      climber = climber->GetOwner();
      if (climber->GetParent()) {
        ownerWithParent = climber;
        break;
      }
    }
    if (!ownerWithParent)
      return DefaultOf(current->GetCategory().get(), key, owner);
    const Style* counterpart = Descend(ownerWithParent->GetParent(), keys, cache);
    if (!counterpart)
      return DefaultOf(current->GetCategory().get(), key, owner);
    if (!owner)
      owner = ownerWithParent;
    source = ValueSource::Owner;
    if (const ZelUtils::Any* own = counterpart->GetProperties().Find(key))
      return Resolution{own, source, counterpart, nullptr, owner};
    current = counterpart;
  }
}

// Resolves `key` on the empty own substyle that `anchor` would hold at the
// end of `virtualKeys` (outermost first), of `category`: the substyle that
// flattening makes where the style only inherits one.
Resolution ResolveVirtual(const Style& anchor, const std::vector<PropertyKey>& virtualKeys,
                          const StyleCategory* category, const PropertyKey& key,
                          ResolutionCache* cache) {
  if (PerStyle(category, key))
    return DefaultOf(category, key, nullptr);
  std::vector<PropertyKey> keys(virtualKeys.rbegin(), virtualKeys.rend());
  const Style* climber = &anchor;
  const Style* ownerWithParent = anchor.GetParent() ? &anchor : nullptr;
  while (!ownerWithParent && climber->GetOwner()) {
    keys.push_back(climber->GetOwnerPropertyKey());
    climber = climber->GetOwner();
    if (climber->GetParent())
      ownerWithParent = climber;
  }
  if (!ownerWithParent)
    return DefaultOf(category, key, nullptr);
  const Style* counterpart = Descend(ownerWithParent->GetParent(), keys, cache);
  if (!counterpart)
    return DefaultOf(category, key, nullptr);
  if (const ZelUtils::Any* own = counterpart->GetProperties().Find(key))
    return Resolution{own, ValueSource::Owner, counterpart, nullptr, ownerWithParent};
  return Inherit(counterpart, key, ValueSource::Owner, ownerWithParent, cache);
}

const StyleCategory* ElementCategory(const BaseStyleProperty& behaviour) {
  const std::shared_ptr<StyleCategory>* category =
      GetStyleManager().FindCategory(behaviour.GetElementCategoryName());
  return category ? category->get() : nullptr;
}

void ListValues(const Style& anchor, std::vector<PropertyKey>& virtualKeys,
                const StyleCategory* category, const Text& prefix, ResolutionCache* cache,
                std::vector<EffectiveValue>& out) {
  if (!category)
    return;
  for (const PropertyKey& key : category->GetPropertyOrder()) {
    const BaseStyleProperty* behaviour = category->GetStyleProperty(key);
    if (!behaviour)
      continue;
    const Text path = prefix + key.GetString();
    const Resolution resolution = !virtualKeys.empty()
                                      ? ResolveVirtual(anchor, virtualKeys, category, key, cache)
                                  : cache ? cache->Resolve(anchor, key)
                                          : ResolveProperty(anchor, key);
    if (behaviour->IsSubstyle()) {
      const Style* own = virtualKeys.empty() ? anchor.GetSubstyle(key, false) : nullptr;
      if (own) {
        std::vector<PropertyKey> none;
        ListValues(*own, none, own->GetCategory().get(), path + u".", cache, out);
        continue;
      }
      // Flattening asks for the effective substyle, which must be one.
      if (!resolution.value->IsTypeCompatible<Style*>())
        throw std::bad_cast();
      if (!resolution.value->Get<Style*>())
        continue;
      virtualKeys.push_back(key);
      ListValues(anchor, virtualKeys, ElementCategory(*behaviour), path + u".", cache, out);
      virtualKeys.pop_back();
      continue;
    }
    const auto* list = resolution.value->GetIf<std::vector<Style*>>();
    out.push_back(EffectiveValue{path, key, behaviour, resolution, list != nullptr});
    if (!list)
      continue;
    for (std::size_t i = 0; i < list->size(); ++i) {
      const Style* element = (*list)[i];
      if (!element)
        continue;
      std::vector<PropertyKey> none;
      ListValues(*element, none, element->GetCategory().get(),
                 path + u"[" + Widen(std::to_string(i)) + u"].", cache, out);
    }
  }
}

} // namespace

Resolution ResolveProperty(const Style& style, const PropertyKey& key) {
  if (const ZelUtils::Any* own = style.GetProperties().Find(key))
    return Resolution{own, ValueSource::Own, &style, nullptr, nullptr};
  if (PerStyle(style.GetCategory().get(), key))
    return DefaultOf(style.GetCategory().get(), key, nullptr);
  return Inherit(&style, key, ValueSource::Ancestor, nullptr, nullptr);
}

std::size_t ResolutionCache::EntryHash::operator()(const Entry& entry) const noexcept {
  return std::hash<const void*>()(entry.first) * 31 + std::hash<PropertyKey>()(entry.second);
}

ResolutionCache::ResolutionCache() = default;
ResolutionCache::~ResolutionCache() = default;

// A style without an own value resolves as its parent does when the parent
// has none either, so a chain of such styles shares one result: each style is
// climbed once per key, however many descendants ask.
Resolution ResolutionCache::Resolve(const Style& style, const PropertyKey& key) {
  if (const ZelUtils::Any* own = style.GetProperties().Find(key))
    return Resolution{own, ValueSource::Own, &style, nullptr, nullptr};
  if (PerStyle(style.GetCategory().get(), key))
    return DefaultOf(style.GetCategory().get(), key, nullptr);
  std::vector<const Style*> pending{&style};
  Resolution result;
  for (;;) {
    const Style* current = pending.back();
    const auto cached = m_resolutions.find(Entry(current, key));
    if (cached != m_resolutions.end()) {
      result = cached->second;
      pending.pop_back();
      break;
    }
    const Style* parent = current->GetParent();
    if (!parent) {
      result = Inherit(current, key, ValueSource::Ancestor, nullptr, this);
      break;
    }
    if (const ZelUtils::Any* own = parent->GetProperties().Find(key)) {
      result = Resolution{own, ValueSource::Ancestor, parent, nullptr, nullptr};
      break;
    }
    pending.push_back(parent);
  }
  for (const Style* waiting : pending)
    m_resolutions.emplace(Entry(waiting, key), result);
  return result;
}

Resolution ResolvePathProperty(const Style& style, const PropertyPath& path) {
  if (path.empty())
    throw std::exception();
  const PropertyKey& last = path.back();
  const Style* reached = &style;
  for (std::size_t i = 0; i + 1 < path.size(); ++i) {
    const Style* next = reached->GetSubstyle(path[i], false);
    if (!next) {
      // Walks the element categories from the root's own category, whatever
      // depth the own substyles ended at, as the core does.
      const StyleCategory* category = style.GetCategory().get();
      for (std::size_t j = i; j + 1 < path.size(); ++j) {
        if (!category)
          throw std::exception();
        if (const BaseStyleProperty* behaviour = category->GetStyleProperty(path[j]))
          category = ElementCategory(*behaviour);
      }
      return DefaultOf(category, last, nullptr);
    }
    reached = next;
  }
  return ResolveProperty(*reached, last);
}

// One style climbs each chain once per key without a cache: a cache would
// remember every style of a long chain for an answer asked only once.
std::vector<EffectiveValue> ListEffectiveValues(const Style& style) {
  std::vector<EffectiveValue> values;
  std::vector<PropertyKey> virtualKeys;
  ListValues(style, virtualKeys, style.GetCategory().get(), Text(), nullptr, values);
  return values;
}

std::vector<EffectiveValue> ListEffectiveValues(const Style& style, ResolutionCache& cache) {
  std::vector<EffectiveValue> values;
  std::vector<PropertyKey> virtualKeys;
  ListValues(style, virtualKeys, style.GetCategory().get(), Text(), &cache, values);
  return values;
}

Text FormatValue(const BaseStyleProperty& behaviour, const ZelUtils::Any& value) {
  if (const auto* list = value.GetIf<std::vector<Style*>>())
    return Widen(std::to_string(list->size()) + (list->size() == 1 ? " style" : " styles"));
  const ZelPref::ConversionPolicy* policy = behaviour.GetConversionPolicy();
  if (!policy || value.IsEmpty())
    return Text();
  try {
    return policy->ToText(value);
  } catch (const std::exception&) {
    return Text();
  }
}

Text DescribeStyle(const StyleSheet& sheet, const Style* style) {
  if (!style)
    return Text();
  std::vector<const PropertyKey*> keys;
  const Style* outermost = style;
  while (outermost->GetOwner()) {
    keys.push_back(&outermost->GetOwnerPropertyKey());
    outermost = outermost->GetOwner();
  }
  Text description = sheet.GetStyleName(outermost);
  if (description.IsEmpty())
    return description;
  for (auto key = keys.rbegin(); key != keys.rend(); ++key)
    description += u" \u203A " + (*key)->GetString();
  return description;
}

} // namespace Tools
} // namespace Styles
