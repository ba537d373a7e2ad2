#include "platform/TSAsset.h"

namespace platform {

std::shared_ptr<TSAsset> TSAsset::downloadAssetWithIdentifier(std::string_view identifier, std::string_view dataclass,
                                                              std::optional<std::string> prettyName) {
  auto asset = std::make_shared<TSAsset>();
  asset->_identifier = identifier;
  asset->_dataclass = dataclass;
  asset->_prettyName = std::move(prettyName);
  asset->_isDownload = true;
  return asset;
}

std::string TSAsset::describe() const {
  std::string text = "<TSAsset " + _identifier;
  text += _isDownload ? " download" : " no download";
  if (_isRestore) text += " restore";
  if (_path) text += " path " + *_path;
  return text + ">";
}

}  // namespace platform
