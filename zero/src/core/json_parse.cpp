#include "qf/zero/core/json_parse.h"

#include <nlohmann/json.hpp>

#include <cstddef>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace qf::zero {

namespace {

using Json = nlohmann::ordered_json;

// Builds the document from the parser's events. One frame per open object or array; frames
// are kept for reuse, so the member lists of objects at one depth share their storage.
class DocumentBuilder {
 public:
  bool null() { return put(Json(nullptr)); }
  bool boolean(bool value) { return put(Json(value)); }
  bool number_integer(Json::number_integer_t value) { return put(Json(value)); }
  bool number_unsigned(Json::number_unsigned_t value) { return put(Json(value)); }
  bool number_float(Json::number_float_t value, const std::string&) { return put(Json(value)); }
  bool string(std::string& value) { return put(Json(std::move(value))); }
  bool binary(Json::binary_t& value) { return put(Json(std::move(value))); }

  bool start_object(std::size_t) {
    open(true);
    return true;
  }
  bool key(std::string& name) {
    Frame& frame = top();
    // A repeated key keeps its first place and takes the later value, as nlohmann's does.
    frame.repeated.reset();
    for (std::size_t i = 0; i < frame.members.size(); ++i) {
      if (frame.members[i].first == name) {
        frame.repeated = i;
        break;
      }
    }
    frame.key = std::move(name);
    return true;
  }
  bool end_object() {
    Frame& frame = top();
    Json object = Json::object();
    auto& members = object.get_ref<Json::object_t&>();
    members.reserve(frame.members.size());
    for (auto& [name, value] : frame.members) members.emplace_back(std::move(name), std::move(value));
    frame.members.clear();
    --depth_;
    return put(std::move(object));
  }

  bool start_array(std::size_t) {
    open(false);
    return true;
  }
  bool end_array() {
    Json array(std::move(top().items));
    top().items.clear();
    --depth_;
    return put(std::move(array));
  }

  template <class Exception>
  bool parse_error(std::size_t, const std::string&, const Exception& error) {
    throw error;
  }

  Json take() { return std::move(root_); }

 private:
  struct Frame {
    bool object = false;
    std::vector<std::pair<std::string, Json>> members;
    Json::array_t items;
    std::string key;
    std::optional<std::size_t> repeated;
  };

  Frame& top() { return frames_[depth_ - 1]; }

  void open(bool object) {
    if (depth_ == frames_.size()) frames_.emplace_back();
    ++depth_;
    top().object = object;
  }

  bool put(Json&& value) {
    if (depth_ == 0) {
      root_ = std::move(value);
      return true;
    }
    Frame& frame = top();
    if (!frame.object) {
      frame.items.push_back(std::move(value));
    } else if (frame.repeated) {
      frame.members[*frame.repeated].second = std::move(value);
    } else {
      frame.members.emplace_back(std::move(frame.key), std::move(value));
    }
    return true;
  }

  std::vector<Frame> frames_;
  std::size_t depth_ = 0;
  Json root_;
};

}  // namespace

Json parseJson(std::string_view text) {
  DocumentBuilder builder;
  Json::sax_parse(text, &builder);
  return builder.take();
}

}  // namespace qf::zero
