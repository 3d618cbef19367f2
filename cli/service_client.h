#pragma once

#include <string>

#include "interface/isentrova_service.h"

namespace sentrova {

// The name under which the loading program registers the rescue service.
inline constexpr char kServiceName[] = "SentrovaService";

struct ServiceConnection {
  android::sp<android::ISentrovaService> service;  // null when there is an error
  std::string error;
};

// Finds the rescue service through the service manager, waiting a few seconds for it to appear.
ServiceConnection connect_to_service();

// What a negative platform status means that a call through the proxy answered with, for a person.
std::string describe_transport_status(int32_t status);

// Whether a proxy's answer is a platform status rather than the service's own answer.
bool is_transport_status(int32_t answer);

}  // namespace sentrova
