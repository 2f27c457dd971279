#include "recorder/recorder.h"

#include "recorder/recording.h"

namespace recorder {

platform::simulated::Machine RecordMachine(platform::Host& host) {
  Recording recording(host);
  RecordDevices(recording);
  RecordInterfaces(recording);
  RecordControllers(recording);
  RecordStorage(recording);
  RecordVolumes(recording);
  return std::move(recording.machine);
}

}  // namespace recorder
