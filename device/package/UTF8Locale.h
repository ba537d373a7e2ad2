#pragma once

#include <locale.h>

namespace device {

/// While it lives the calling thread takes text of several bytes for UTF-8, whatever locale the process has. Changes
/// nothing where there is no such locale.
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
