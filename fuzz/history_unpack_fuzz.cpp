// Any body a peer pushes to a served repository: the push is taken or refused with a
// catalog error, and a refused push leaves the repository model byte-identical. The text
// travels as the body of a "Push" packet, so the codec's limits apply as on the wire.
#include "foundation/core/except/exception.h"
#include "kiv/kiv.h"
#include "kiv/repository/packet_answers.h"
#include "qf/zero/io/json_serializer.h"
#include "qf/zero/io/packet_codec.h"

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <string>

namespace {

std::string dumpOf(const qf::zero::Model& model) {
  qf::zero::io::JSONSerializer serializer;
  serializer.getCustomizer().setShouldSkipDefaultValues(false);
  nlohmann::ordered_json document;
  serializer.serialize(model, qf::zero::io::SerializationOutput::forIntermediateFormat(&document));
  return document.dump();
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  kiv::MetaPackageKiv::getInstance();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string text = R"({"type":"Push","id":1,"body":)";
  text.append(reinterpret_cast<const char*>(data), size);
  text += '}';
  std::optional<qf::zero::io::PacketEnvelope> envelope;
  try {
    envelope.emplace(qf::zero::io::PacketCodec::decode(text));
  } catch (const foundation::core::except::ExceptionBase&) {
    return 0;  // the codec's own target covers what it refuses
  }

  const qf::zero::Model repositories = qf::zero::Model::create();
  const qf::zero::Model user = qf::zero::Model::create();
  const kiv::LocalRepository served = kiv::LocalRepository::create(repositories, user);
  served->init(kiv::RepoType::Bare);
  const std::string before = dumpOf(repositories);
  try {
    const qf::zero::io::JSONPacket answer = kiv::answerPush(served, envelope->packet);
    if (answer.getType() != "OK" && answer.getType() != "CannotPush") {
      std::fprintf(stderr, "history unpack: a push answered %s\n", answer.getType().c_str());
      std::abort();
    }
    if (answer.getType() == "CannotPush" && dumpOf(repositories) != before) {
      std::fprintf(stderr, "history unpack: a refused push changed the repository\n");
      std::abort();
    }
  } catch (const foundation::core::except::ExceptionBase&) {
    if (dumpOf(repositories) != before) {
      std::fprintf(stderr, "history unpack: a push that raised changed the repository\n");
      std::abort();
    }
  }
  return 0;
}
