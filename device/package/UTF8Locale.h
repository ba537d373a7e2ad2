#pragma once

#include <locale.h>

namespace device {

/// While it lives the calling thread reads multi-byte text as UTF-8, whatever locale the process has. Changes nothing
/// on a system without such a locale.
class UTF8Locale {
 public:
  UTF8Locale() : _own(::newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr)), _before(_own ? ::uselocale(_own) : nullptr) {}
  ~UTF8Locale() {
    if (!_own) return;
    ::uselocale(_before);
    ::freelocale(_own);
  }
  UTF8Locale(const UTF8Locale&) = delete;
  UTF8Locale& operator=(const UTF8Locale&) = delete;

 private:
  const locale_t _own;
  const locale_t _before;
};

}  // namespace device
