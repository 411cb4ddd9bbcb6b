// libFuzzer target: renders arbitrary templates (and templates under other delimiters) over a fixed set
// of variables, twice on one engine, checking only that nothing crashes, hangs or trips a sanitizer.
//
// Build and run from /work/main (clang 14 from Debian; the tests are left out of this configuration):
//   cmake -S . -B build-gx-fuzz -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_COMPILER=clang++-14 \
//         -DTESSAL_BUILD_FUZZERS=ON -DTESSAL_BUILD_TESTS=OFF
//   ninja -C build-gx-fuzz template_fuzzer
//   mkdir -p /tmp/template-corpus
//   build-gx-fuzz/GXTemplate/template_fuzzer -max_total_time=600 -timeout=10 -rss_limit_mb=2048 \
//     -max_len=4096 -dict=tests/fuzz/template.dict /tmp/template-corpus tests/fuzz/corpus
// New inputs go to the scratch corpus (first folder); tests/fuzz/corpus holds the seeds kept in the
// repository, which are also the rows of the golden table in tests/gxtemplate. Reproduce a finding with:
// build-gx-fuzz/GXTemplate/template_fuzzer CRASH_FILE
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
