// Pages of character classes, loaded on first use and never freed while anyone may read them.
#include "foundations/char_tables.h"

#include <array>
#include <atomic>
#include <memory>

namespace quillet {

namespace {

uint8_t DefaultClassOf(uint32_t code_point) {
  if (code_point >= 0x80) {
    const bool control = code_point < 0xa0;
    return kCharAlpha | kCharIdStart | kCharIdContinue | (control ? 0 : kCharPrintable);
  }
  uint8_t classes = code_point >= 0x20 && code_point != 0x7f ? kCharPrintable : 0;
  const uint32_t folded = code_point | 0x20;
  if (folded >= 'a' && folded <= 'z') {
    classes |= kCharAlpha | kCharIdStart | kCharIdContinue;
  } else if (code_point >= '0' && code_point <= '9') {
    classes |= kCharDecimal | kCharDigit | kCharNumeric | kCharIdContinue;
  } else if (code_point == '_') {
    classes |= kCharIdStart | kCharIdContinue;
  } else if (code_point == ' ' || (code_point >= 0x09 && code_point <= 0x0d) ||
             (code_point >= 0x1c && code_point <= 0x1f)) {
    // Python counts the four separators of 0x1c to 0x1f as space, which C's isspace does not.
    classes |= kCharSpace;
  }
  return classes;
}

void LoadDefaultPage(uint32_t first, uint8_t* classes) {
  for (uint32_t i = 0; i < kCharPageSize; ++i) classes[i] = DefaultClassOf(first + i);
}

// Never freed once it is published: a reader may still look at one that a new loader replaced. `before`
// links all of them, so that each stays reachable.
struct Page {
  std::array<uint8_t, kCharPageSize> classes;
  const Page* before = nullptr;
};

// Without a mutex, which a process that forks while another thread holds it would never get.
struct Pages {
  std::array<std::atomic<const Page*>, kCodePointLimit / kCharPageSize> by_number{};
  std::atomic<CharPageLoader> loader{LoadDefaultPage};
  std::atomic<const Page*> latest{nullptr};
};

Pages& ThePages() {
  static constinit Pages pages;
  return pages;
}

const Page* LoadPage(Pages& pages, uint32_t number) {
  auto page = std::make_unique<Page>();
  pages.loader.load(std::memory_order_acquire)(number * kCharPageSize, page->classes.data());
  const Page* published = nullptr;
  if (!pages.by_number[number].compare_exchange_strong(published, page.get(), std::memory_order_acq_rel)) {
    return published;  // another thread was first
  }
  Page* const kept = page.release();
  kept->before = pages.latest.exchange(kept, std::memory_order_acq_rel);
  return kept;
}

}  // namespace

uint8_t CharClassOf(uint32_t code_point) {
  if (code_point >= kCodePointLimit) return 0;
  Pages& pages = ThePages();
  const uint32_t number = code_point / kCharPageSize;
  const Page* page = pages.by_number[number].load(std::memory_order_acquire);
  if (page == nullptr) [[unlikely]]
    page = LoadPage(pages, number);
  return page->classes[code_point % kCharPageSize];
}

void SetCharPageLoader(CharPageLoader loader) {
  Pages& pages = ThePages();
  pages.loader.store(loader != nullptr ? loader : LoadDefaultPage, std::memory_order_release);
  for (auto& page : pages.by_number) page.store(nullptr, std::memory_order_release);
}

}  // namespace quillet
