// Pages of character classes, loaded on first use and never freed while anyone may read them.
#include "foundations/char_tables.h"

#include <array>
#include <atomic>
#include <memory>
#include <mutex>
#include <vector>

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

using Page = std::array<uint8_t, kCharPageSize>;

struct Pages {
  std::array<std::atomic<const Page*>, kCodePointLimit / kCharPageSize> by_number{};
  std::atomic<CharPageLoader> loader{LoadDefaultPage};
  // Owns every page ever published: a reader may still look at one that a new loader replaced.
  std::mutex owned_mutex;
  std::vector<std::unique_ptr<const Page>> owned;
};

Pages& ThePages() {
  static Pages pages;
  return pages;
}

// The loader runs without the mutex, since a host's loader waits for the host's own lock.
const Page* LoadPage(Pages& pages, uint32_t number) {
  auto page = std::make_unique<Page>();
  pages.loader.load(std::memory_order_acquire)(number * kCharPageSize, page->data());
  const std::lock_guard<std::mutex> lock(pages.owned_mutex);
  const Page* published = nullptr;
  if (!pages.by_number[number].compare_exchange_strong(published, page.get(), std::memory_order_acq_rel)) {
    return published;  // another thread was first
  }
  pages.owned.push_back(std::move(page));
  return pages.owned.back().get();
}

}  // namespace

uint8_t CharClassOf(uint32_t code_point) {
  if (code_point >= kCodePointLimit) return 0;
  Pages& pages = ThePages();
  const uint32_t number = code_point / kCharPageSize;
  const Page* page = pages.by_number[number].load(std::memory_order_acquire);
  if (page == nullptr) [[unlikely]]
    page = LoadPage(pages, number);
  return (*page)[code_point % kCharPageSize];
}

void SetCharPageLoader(CharPageLoader loader) {
  Pages& pages = ThePages();
  pages.loader.store(loader != nullptr ? loader : LoadDefaultPage, std::memory_order_release);
  for (auto& page : pages.by_number) page.store(nullptr, std::memory_order_release);
}

}  // namespace quillet
