// KXGReader on arbitrary bytes, fed whole and in small pieces: no crash, no
// sanitizer report, the same records and problems either way, and every
// line's text valid UTF-8.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>
#include <vector>

#include "kxacore/Extensions/KXAStringExtensions.h"
#include "kxacore/Gedcom/KXGReader.h"

namespace {

struct Recorder final : KXGReaderDelegate {
  std::vector<std::string> events;
  void readerDidReadRecord(KXGReader&, const KXGRecord& record) override {
    for (const KXGLine& line : record.lines()) {
      if (!kxa_isValidUTF8(line.tag) || !kxa_isValidUTF8(line.value) || !kxa_isValidUTF8(line.xref)) {
        std::abort();
      }
      if (line.parent >= static_cast<int>(record.size())) std::abort();
      events.push_back(std::to_string(line.number) + line.xref + "|" + line.tag + "|" + line.value);
    }
  }
  void readerDidFindProblem(KXGReader&, const KXGFinding& finding) override {
    if (finding.line == 0) std::abort();
    events.push_back(std::to_string(finding.line) + finding.code);
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::span<const std::uint8_t> bytes(data, size);
  Recorder whole;
  {
    KXGReader reader(&whole);
    reader.appendBytes(bytes);
    reader.finish();
  }
  Recorder pieces;
  {
    KXGReader reader(&pieces);
    // Pieces of 1, 2, 3 ... bytes: every boundary position gets cut somewhere.
    std::size_t step = 1;
    for (std::size_t pos = 0; pos < size; pos += step, ++step) {
      reader.appendBytes(bytes.subspan(pos, std::min(step, size - pos)));
    }
    reader.finish();
  }
  // The character set is chosen from the first 64 KiB either way, so a cut
  // never changes what is read.
  if (whole.events != pieces.events) std::abort();
  return 0;
}
