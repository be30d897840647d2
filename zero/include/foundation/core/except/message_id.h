#pragma once

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/message_argument.h"

#include <string>
#include <string_view>
#include <vector>

namespace foundation::core::except {

// Identifies one message: the catalog it belongs to, its key in that catalog, and the arguments
// for the key's placeholders. Catalog name and key are kept as two separate texts; "catalog/key"
// is only their printed form.
class MessageId {
 public:
  MessageId(const Catalog& catalog, std::string_view key, std::vector<MessageArgument> arguments = {});

  // For an id whose catalog is not linked into this program (e.g. one received from a peer).
  // It compares equal to the same id built from the catalog, but renders without a text.
  MessageId(std::string catalogName, std::string key, std::vector<MessageArgument> arguments = {});

  // Null when the id was built from a catalog name only.
  const Catalog* catalog() const noexcept { return catalog_; }
  const std::string& catalogName() const noexcept { return catalogName_; }
  const std::string& key() const noexcept { return key_; }
  const std::vector<MessageArgument>& arguments() const noexcept { return arguments_; }

  // The catalog text with each placeholder {n} replaced by argument n (UTF-16 text converted to
  // UTF-8, integers in decimal). A placeholder without an argument stays as written. Without a
  // text for the key, renders "catalog/key" followed by the arguments in parentheses.
  std::string render() const;

  // "catalog/key", e.g. "qf0:messages/NoSuchType".
  std::string toString() const;

  // Catalog name, key and arguments; which Catalog object the id points to does not matter.
  friend bool operator==(const MessageId& lhs, const MessageId& rhs);

 private:
  const Catalog* catalog_;
  std::string catalogName_;
  std::string key_;
  std::vector<MessageArgument> arguments_;
};

// UTF-8 text of one argument as render() shows it.
std::string argumentText(const MessageArgument& argument);

}  // namespace foundation::core::except
