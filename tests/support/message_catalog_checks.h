#pragma once

// Walks a message catalog against its message classes: every key has a text and a class, each
// class raises its own exception type through reportException, and every placeholder of a text
// is filled by an argument of the class (and every argument shown).

#include "foundation/core/except/catalog.h"
#include "foundation/core/except/exception.h"
#include "qf/zero/core/report_exception.h"
#include "qf/zero/core/text.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

namespace support {

enum class ArgumentWidth { narrow, wide, integer };

// What a handler of one raised message sees.
struct RaisedMessage {
  bool caughtAsExactType = false;
  std::string getId;
  std::string what;
  std::string catalogName;
  std::string key;
  const foundation::core::except::Catalog* catalog = nullptr;
  std::vector<foundation::core::except::MessageArgument> arguments;
};

struct MessageRow {
  std::string_view key;
  std::vector<std::string> argumentTexts;  // as the rendered text must show them
  std::vector<ArgumentWidth> widths;       // as the arguments must be stored
  std::function<RaisedMessage()> raise;
};

inline std::string sampleText(const char* s) { return s; }
inline std::string sampleText(const char16_t* s) { return qf::zero::toUtf8(s); }
inline std::string sampleText(int n) { return std::to_string(n); }
inline ArgumentWidth sampleWidth(const char*) { return ArgumentWidth::narrow; }
inline ArgumentWidth sampleWidth(const char16_t*) { return ArgumentWidth::wide; }
inline ArgumentWidth sampleWidth(int) { return ArgumentWidth::integer; }

// A row for message class M built from sample arguments: narrow or UTF-16 literals, or ints.
template <class M, class... Args>
MessageRow messageRow(Args... args) {
  MessageRow row{M::key, {sampleText(args)...}, {sampleWidth(args)...}, {}};
  row.raise = [=]() {
    RaisedMessage raised;
    try {
      qf::zero::reportException(M(args...));
    } catch (const foundation::core::except::Exception<M>& e) {
      const foundation::core::except::MessageId& id = e.getMessage().id();
      raised = {true, e.GetID(), e.what(), id.catalogName(), id.key(), id.catalog(), id.arguments()};
    } catch (...) {
    }
    return raised;
  };
  return row;
}

// Numbers of the placeholders "{n}" in a text.
inline std::set<std::size_t> placeholdersOf(std::string_view text) {
  std::set<std::size_t> result;
  for (std::size_t open = text.find('{'); open != std::string_view::npos; open = text.find('{', open + 1)) {
    std::size_t end = open + 1;
    std::size_t n = 0;
    while (end < text.size() && text[end] >= '0' && text[end] <= '9')
      n = n * 10 + std::size_t(text[end++] - '0');
    if (end > open + 1 && end < text.size() && text[end] == '}') result.insert(n);
  }
  return result;
}

inline void checkCatalog(const foundation::core::except::Catalog& catalog,
                         const std::vector<MessageRow>& rows) {
  std::set<std::string_view> catalogKeys;
  for (const foundation::core::except::CatalogEntry& entry : catalog.entries()) {
    EXPECT_TRUE(catalogKeys.insert(entry.key).second) << "duplicate key " << entry.key;
    EXPECT_FALSE(entry.text.empty()) << entry.key;
  }
  std::set<std::string_view> classKeys;
  for (const MessageRow& row : rows) classKeys.insert(row.key);
  EXPECT_EQ(classKeys, catalogKeys) << "every key needs both a text and a message class";

  for (const MessageRow& row : rows) {
    SCOPED_TRACE(std::string(row.key));
    const std::optional<std::string_view> text = catalog.textOf(row.key);
    ASSERT_TRUE(text.has_value());
    std::set<std::size_t> oneToN;
    for (std::size_t i = 1; i <= row.argumentTexts.size(); ++i) oneToN.insert(i);
    EXPECT_EQ(placeholdersOf(*text), oneToN)
        << "each argument needs exactly the placeholders {1}..{n}: " << *text;

    const RaisedMessage raised = row.raise();
    ASSERT_TRUE(raised.caughtAsExactType);
    EXPECT_EQ(raised.getId, std::string(catalog.name()) + "/" + std::string(row.key));
    EXPECT_EQ(raised.catalogName, catalog.name());
    EXPECT_EQ(raised.key, row.key);
    EXPECT_EQ(raised.catalog, &catalog);
    EXPECT_TRUE(placeholdersOf(raised.what).empty()) << raised.what;
    for (const std::string& argument : row.argumentTexts)
      EXPECT_NE(raised.what.find(argument), std::string::npos) << raised.what << " lacks " << argument;
    ASSERT_EQ(raised.arguments.size(), row.widths.size());
    for (std::size_t i = 0; i < row.widths.size(); ++i) {
      const ArgumentWidth width = row.widths[i];
      const auto& argument = raised.arguments[i];
      EXPECT_EQ(std::holds_alternative<std::string>(argument), width == ArgumentWidth::narrow) << i;
      EXPECT_EQ(std::holds_alternative<std::u16string>(argument), width == ArgumentWidth::wide) << i;
      EXPECT_EQ(std::holds_alternative<std::int64_t>(argument), width == ArgumentWidth::integer) << i;
    }
  }
}

}  // namespace support
