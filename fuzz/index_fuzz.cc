// Any bytes as an index that says of itself that it is whole: it is refused, or asked and taken over.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "foundations/errors.h"
#include "index/bytes.h"
#include "index/name_index.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  using namespace quillet;
  const Text given(reinterpret_cast<const char*>(data), size);
  static const std::string header = NameIndexWriter().Finish("").substr(0, 16);
  std::string bytes = header;
  AppendFixed(HashOfBytes(given), bytes);
  bytes += given;
  if (NameIndex::StateOf(bytes) != NameIndex::State::kFine) std::abort();
  try {
    const NameIndex index(bytes);
    Question question;
    question.match = Question::Match::kGlob;
    question.name = "*t*";
    question.returns = true;
    for (const uint32_t file : index.FilesFor(WordsNeededBy(question))) {
      index.ForEachWordOf(file, [&](uint32_t word, Uses) {
        if (word >= index.words().size()) std::abort();
      });
    }
    NameIndexWriter writer;
    for (size_t i = 0; i < index.size(); ++i) writer.Keep(index, i, 0, 0);
    if (NameIndex::StateOf(writer.Finish("")) != NameIndex::State::kFine) std::abort();
  } catch (const Error&) {
    // No index.
  }
  return 0;
}
