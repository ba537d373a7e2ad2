#include "tsd/report/ReportPage.h"

#include <string_view>

#include "device/boundary/Journal.h"
#include "tsd/report/PageSources.h"

namespace tsd {
namespace {

/// JSON without anything that could end the element that contains it.
std::string jsonForMarkup(const platform::Value& document) {
  const std::string json = device::jsonText(document);
  std::string text;
  text.reserve(json.size() + json.size() / 16);
  for (char c : json) {
    if (c == '<')
      text += "\\u003c";
    else if (c == '>')
      text += "\\u003e";
    else if (c == '&')
      text += "\\u0026";
    else
      text += c;
  }
  return text;
}

}  // namespace

std::string reportPage(const platform::Value& document) {
  struct Part {
    std::string_view mark;
    std::string content;
  };
  const Part parts[] = {{"{{STYLE}}", std::string(reportStyle)},
                        {"{{DATA}}", jsonForMarkup(document)},
                        {"{{SCRIPT}}", std::string(reportScript)}};
  std::string page;
  std::string_view rest = reportMarkup;
  for (const auto& part : parts) {
    std::size_t at = rest.find(part.mark);
    page.append(rest.substr(0, at)).append(part.content);
    rest.remove_prefix(at + part.mark.size());
  }
  return page.append(rest);
}

}  // namespace tsd
