// The process-wide switches: XMP writing disabled, all metadata forced
// writable.
#include <ovracore/Diagnostics.h>
#include <ovracore/SharedFunctions.h>

#include "InitializeInternal.h"

namespace ovrametadata {

namespace {

const char* const kForceMetadataWritableKey = "ForceMetadataWritable";

// Set up and changed from the client's main thread only, hence no lock.
bool sXMPWritingDisabled = false;
ovracore::SharedFunctions<boost::shared_ptr<XMPWritingChangedCallback>> sXMPWritingCallbacks;

}  // namespace

void DisableXMPWriting(bool disabled) {
  if (disabled == sXMPWritingDisabled) return;
  sXMPWritingDisabled = disabled;
  sXMPWritingCallbacks.CallAll();
}

bool IsXMPWritingDisabled() { return sXMPWritingDisabled; }

void NotifyWhenXMPWritingChanged(boost::shared_ptr<XMPWritingChangedCallback> const& callback) {
  sXMPWritingCallbacks.Add(callback);
}

void ForcedAllMetadataWritable(bool force) {
  ovracore::SetDebugValue(kForceMetadataWritableKey, force ? "true" : "false");
}

bool IsAllMetadataForcedWritable() {
  return ovracore::GetDebugValue(kForceMetadataWritableKey, "false") == "true";
}

void DeleteEmptyXMPWritingCallbacks() { sXMPWritingCallbacks.DeleteEmptyFunctions(); }

void ClearXMPWritingCallbacks() { sXMPWritingCallbacks.Clear(); }

}  // namespace ovrametadata
