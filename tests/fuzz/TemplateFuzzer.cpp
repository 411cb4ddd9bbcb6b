// libFuzzer target: renders arbitrary templates twice on one engine (see README.md).
#include "TemplateFuzzInput.h"

#include <cstdint>

namespace {
class Quiet : public GXTemplateEngineDelegate {};
}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const QVariantMap variables = templatefuzz::variables();
  GXTemplateEngine engine;
  Quiet delegate;
  engine.setDelegate(&delegate);
  const QString text = templatefuzz::prepare(engine, reinterpret_cast<const char*>(data), size);
  // Twice: state left by the first run (globals, cycles, loaded handlers) must not upset the second.
  for (int run = 0; run < 2; ++run) {
    const QString output = engine.processTemplate(text, variables);
    if (output.isNull()) __builtin_trap();  // a matcher is set: there is always a result
  }
  return 0;
}
