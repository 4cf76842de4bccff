#pragma once

#include "platform/assistant/Model.h"
#include "platform/net/ServerInteractionController.h"
#include "platform/value/Value.h"

#include <memory>
#include <mutex>
#include <optional>

namespace kyn {

/// The one way from an assistant command to the server: builds the server command, sends it, and
/// maps the outcome to the assistant's reply and error codes.
class KYNAXDataSource {
 public:
  /// The shared instance, created on first use with a new server interaction controller.
  static KYNAXDataSource& dataSource();

  KYNAXDataSource();
  KYNAXDataSource(const KYNAXDataSource&) = delete;
  KYNAXDataSource& operator=(const KYNAXDataSource&) = delete;

  /// Sends a get-locations request for a validated search and returns at once; `completion` gets
  /// the reply's dictionary once the server has answered.
  void search(const AXKynSearch& command, AXCompletion completion);
  /// Sends a show/hide-location request for a validated visibility command (hiding the location
  /// exactly when `visible` is not yes) and returns at once; `completion` gets the reply's dictionary
  /// once the server has answered.
  void setVisibility(const AXKynVisibilityStateSet& command, AXCompletion completion);

  /// Sends a set-geofence request for a validated geofence command and returns at once;
  /// `completion` gets the reply's dictionary once the server has answered.
  void setGeoFence(const AXKynGeoFenceSet& command, AXCompletion completion);

  /// Reads the "MockLocations" resource into `mockLocations` unless already read. No request path
  /// uses it.
  void loadMockLocationData();
  /// Logs the object it is given.
  void dataLoaded(const Value& object);

  [[nodiscard]] std::shared_ptr<platform::KYServerInteractionController> serverInteractionController() const;
  void setServerInteractionController(std::shared_ptr<platform::KYServerInteractionController> controller);

  [[nodiscard]] const std::optional<Value>& mockLocations() const noexcept { return mockLocations_; }

 private:
  /// Hands the command to the controller; without one, answers it at once.
  void send(const std::shared_ptr<platform::KYJSONCommand>& request, std::function<void()> callback);

  mutable std::mutex mutex_;
  std::shared_ptr<platform::KYServerInteractionController> controller_;
  std::optional<Value> mockLocations_;
};

}  // namespace kyn
