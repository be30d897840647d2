#include "qf/zero/core/primitive_collection.h"

#include "qf/zero/core/messages.h"
#include "qf/zero/core/report_exception.h"

#include <algorithm>

namespace qf::zero {

namespace {

void checkIndex(std::size_t index, std::size_t size) {
  if (index >= size) {
    reportException(
        qf0::messages::IndexOutOfRange(static_cast<std::int64_t>(index), static_cast<std::int64_t>(size)));
  }
}

}  // namespace

void PrimitiveCollection::checkItem(const Value& value) const {
  if (value.isEmpty() || value.isList()) reportException(qf0::messages::InvalidValue());
  owner_->checkAssignable(property_, value);
}

Value PrimitiveCollection::genericAt(std::size_t index) const {
  checkIndex(index, size());
  return getAllValues()[index];
}

std::optional<std::size_t> PrimitiveCollection::genericIndexOf(const Value& value) const {
  const std::vector<Value> values = getAllValues();
  auto it = std::find(values.begin(), values.end(), value);
  if (it == values.end()) return std::nullopt;
  return static_cast<std::size_t>(it - values.begin());
}

void PrimitiveCollection::genericInsert(std::size_t index, const Value& value) {
  Operation operation(*this);
  checkItem(value);
  if (isUnique() && genericIndexOf(value)) return;
  if (index > size()) checkIndex(index, size());
  modifying();
  basicInsertValue(index, value);
  operation.commit();
}

bool PrimitiveCollection::genericRemove(const Value& value) {
  const auto index = genericIndexOf(value);
  if (!index) return false;
  genericRemoveAt(*index);
  return true;
}

void PrimitiveCollection::genericRemoveAt(std::size_t index) {
  checkIndex(index, size());
  Operation operation(*this);
  modifying();
  basicEraseAt(index);
  operation.commit();
}

void PrimitiveCollection::genericClear() {
  if (size() == 0) return;
  Operation operation(*this);
  modifying();
  basicClearValues();
  operation.commit();
}

void PrimitiveCollection::genericReplace(std::size_t index, const Value& value) {
  checkIndex(index, size());
  Operation operation(*this);
  checkItem(value);
  modifying();
  basicEraseAt(index);
  basicInsertValue(index, value);
  operation.commit();
}

void PrimitiveCollection::genericEnsureAt(std::size_t index) {
  if (index < size()) return;
  Operation operation(*this);
  const Value filler = property_->getDefaultValue();
  if (filler.isEmpty()) reportException(qf0::messages::InvalidValue());
  modifying();
  while (size() <= index) basicInsertValue(size(), filler);
  operation.commit();
}

void PrimitiveCollection::copyValues(const std::vector<Value>& values) {
  Operation operation(*this);
  for (const Value& value : values) checkItem(value);
  modifying();
  basicClearValues();
  for (const Value& value : values) {
    if (isUnique() && genericIndexOf(value)) continue;
    basicInsertValue(size(), value);
  }
  operation.commit();
}

bool PrimitiveCollection::sameContents(const std::vector<Value>& items) const {
  const std::vector<Value> current = getAllValues();
  if (isUnique())
    return current.size() == items.size() &&
           std::is_permutation(current.begin(), current.end(), items.begin());
  return current == items;
}

}  // namespace qf::zero
