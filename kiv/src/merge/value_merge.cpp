#include "merge/value_merge.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <map>
#include <set>
#include <utility>
#include <vector>

namespace kiv::merge {

namespace {

using qf::zero::JsonValue;

const JsonValue& itemsOf(const JsonValue& value) {
  static const JsonValue none = JsonValue::array();
  return value.is_array() ? value : none;
}

// A sequence item: its value and how many equal values precede it.
using Item = std::pair<JsonValue, int>;

std::vector<Item> itemsWithOccurrence(const JsonValue& array) {
  std::vector<Item> items;
  std::map<JsonValue, int> seen;
  for (const JsonValue& value : itemsOf(array)) items.emplace_back(value, seen[value]++);
  return items;
}

std::vector<Item> keepOnly(const std::vector<Item>& items, const std::set<Item>& kept) {
  std::vector<Item> result;
  for (const Item& item : items) {
    if (kept.count(item) != 0) result.push_back(item);
  }
  return result;
}

// Inserts `side`'s items that `placed` lacks, each after the item that precedes it on
// that side; an item that comes first on its side goes to the front. Insertions of an
// earlier side at the same place (flagged in `inserted`) stay before them.
void insertAdditions(std::vector<Item>& result, std::vector<bool>& inserted, const std::vector<Item>& side,
                     std::set<Item>& placed) {
  std::size_t position = 0;  // just after the last item of `side` met in `result`
  for (const Item& item : side) {
    if (placed.count(item) != 0) {
      position = static_cast<std::size_t>(std::find(result.begin(), result.end(), item) - result.begin()) + 1;
      continue;
    }
    while (position < result.size() && inserted[position]) ++position;
    result.insert(result.begin() + static_cast<std::ptrdiff_t>(position), item);
    inserted.insert(inserted.begin() + static_cast<std::ptrdiff_t>(position), true);
    placed.insert(item);
    ++position;
  }
}

}  // namespace

ValueMerge mergeSingle(const JsonValue& base, const JsonValue& ours, const JsonValue& theirs,
                       bool preferTheirs) {
  if (ours == theirs || theirs == base) return {ours};
  if (ours == base) return {theirs};
  return {preferTheirs ? theirs : ours, true};
}

ValueMerge mergeSet(const JsonValue& base, const JsonValue& ours, const JsonValue& theirs) {
  const auto asSet = [](const JsonValue& array) {
    const JsonValue& items = itemsOf(array);
    return std::set<JsonValue>(items.begin(), items.end());
  };
  const std::set<JsonValue> b = asSet(base), o = asSet(ours), t = asSet(theirs);
  std::set<JsonValue> merged;
  for (const JsonValue& item : b) {
    if (o.count(item) != 0 && t.count(item) != 0) merged.insert(item);
  }
  for (const std::set<JsonValue>* side : {&o, &t}) {
    for (const JsonValue& item : *side) {
      if (b.count(item) == 0) merged.insert(item);
    }
  }
  JsonValue result = JsonValue::array();
  for (const JsonValue& item : merged) result.push_back(item);
  return {std::move(result)};
}

ValueMerge mergeSequence(const JsonValue& base, const JsonValue& ours, const JsonValue& theirs,
                         bool preferTheirs) {
  if (ours == theirs || theirs == base) return {itemsOf(ours)};
  if (ours == base) return {itemsOf(theirs)};
  const std::vector<Item> b = itemsWithOccurrence(base), o = itemsWithOccurrence(ours),
                          t = itemsWithOccurrence(theirs);
  const std::set<Item> inOurs(o.begin(), o.end()), inTheirs(t.begin(), t.end());
  std::set<Item> survivors;
  for (const Item& item : b) {
    if (inOurs.count(item) != 0 && inTheirs.count(item) != 0) survivors.insert(item);
  }
  const std::vector<Item> baseOrder = keepOnly(b, survivors), ourOrder = keepOnly(o, survivors),
                          theirOrder = keepOnly(t, survivors);
  ValueMerge merged;
  std::vector<Item> result;
  if (ourOrder == theirOrder || theirOrder == baseOrder) {
    result = ourOrder;
  } else if (ourOrder == baseOrder) {
    result = theirOrder;
  } else {
    result = preferTheirs ? theirOrder : ourOrder;
    merged.conflict = true;
  }
  // Items removed on either side are gone; what either side added is placed.
  std::set<Item> placed(survivors);
  const std::set<Item> inBase(b.begin(), b.end());
  const auto additionsOf = [&](const std::vector<Item>& side) {
    std::vector<Item> kept;
    for (const Item& item : side) {
      if (survivors.count(item) != 0 || inBase.count(item) == 0) kept.push_back(item);
    }
    return kept;
  };
  std::vector<bool> inserted(result.size(), false);
  const std::vector<Item> first = additionsOf(preferTheirs ? t : o),
                          second = additionsOf(preferTheirs ? o : t);
  insertAdditions(result, inserted, first, placed);
  insertAdditions(result, inserted, second, placed);
  merged.value = JsonValue::array();
  for (Item& item : result) merged.value.push_back(std::move(item.first));
  return merged;
}

}  // namespace kiv::merge
