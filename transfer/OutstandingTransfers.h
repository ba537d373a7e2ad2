#pragma once

#include <string>
#include <vector>

#include "core/AppsClient.h"
#include "core/Candidate.h"

namespace appsync {

/// Works out which packages the host must still send: made for one call, gone with its answer.
class AppsClient::OutstandingTransfers {
 public:
  explicit OutstandingTransfers(AppsClient& client);

  /// The records of the apps that are prepared, in the order in which they are wanted.
  std::vector<TSAssetRef> run();

 private:
  /// What has become of one candidate.
  enum class Verdict { notWanted, failed, prepared };

  // Gathering the candidates.
  void addPlaceholders();
  void addRequests();
  void removeInProgress();

  // One of them.
  Verdict consider(const Candidate& candidate, TSAssetRef& asset);
  bool isWanted(const Candidate& candidate) const;
  TSAssetRef makeAsset(const Candidate& candidate) const;
  bool prepare(const TSAssetRef& asset);
  void giveUp(const std::string& identifier);

  AppsClient& _client;
  const Platform& _platform;
  const bool _installationAllowed;
  const Value _todoList;  // array, or absent
  StringSet _systemAppPlaceholders;
  StringSet _requestedIDs;
  Candidates _idsWeWant;
};

}  // namespace appsync
