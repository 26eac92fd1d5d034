// Error reporting: the process-wide error list and the error callbacks.
#include <iterator>

#include <ovracore/Diagnostics.h>
#include <ovracore/Localizer.h>
#include <ovracore/Mutex.h>
#include <ovracore/SharedFunctions.h>

#include "InitializeInternal.h"

namespace ovrametadata {

namespace {

const char* const kErrorFormats[] = {
    "$$$/ovrametadata/DefinitionParsingError=Error parsing definitions file: @0",
    "$$$/ovrametadata/DefinitionRegistrationError=Error registering definition: @0",
    "$$$/ovrametadata/ErrorReadingXMP=Error reading XMP data: @0",
    "$$$/ovrametadata/ErrorWritingXMP=Error writing XMP data: @0",
    "$$$/ovrametadata/ViewDefinitionParsingError=Error parsing view definitions file: @0",
    "$$$/ovrametadata/ViewDefinitionRegistrationError=Error registering view definition: @0",
    "@0",
    "$$$/ovrametadata/ExtensionManifestParsingError=Error parsing manifest file: @0",
    "$$$/ovrametadata/ExtensionPackageRegistrationError=Error registering extension package: @0",
};

ovracore::Mutex sErrorInfoMutex;
std::vector<ErrorInfo> sErrorInfos;

using ErrorCallbackList = ovracore::SharedFunctions<boost::shared_ptr<ErrorCallback>>;
ErrorCallbackList sErrorCallbacks;

// The message goes in after localising the format, so that text from a
// file or the toolkit is never taken for a key or a placeholder.
UTF16String FormatErrorText(ErrorType type, UTF16String const& message) {
  const auto index = static_cast<unsigned>(type);
  if (index >= std::size(kErrorFormats)) return {};
  UTF16String text = ovracore::ZString(kErrorFormats[index]);
  const UTF16String placeholder = u"@0";
  for (auto pos = text.find(placeholder); pos != UTF16String::npos;
       pos = text.find(placeholder, pos + message.size())) {
    text.replace(pos, placeholder.size(), message);
  }
  return text;
}

}  // namespace

void SendError(ErrorType type, UTF16String const& message, UTF16String const& source) {
  UTF16String text;
  try {
    text = FormatErrorText(type, message);
  } catch (...) {
    ovracore::RaiseAssertion(
        {"false", "src/Initialize",
         "void ovrametadata::SendError(ovrametadata::ErrorType, const ovracore::UTF16String &, "
         "const ovracore::UTF16String &)",
         "the error text could not be built"});
    return;
  }
  {
    ovracore::LockGuard<ovracore::Mutex> lock(sErrorInfoMutex);
    sErrorInfos.push_back(ErrorInfo{type, text, source});
  }
  // Outside the lock: a callback may ask for the error list.
  sErrorCallbacks.CallAll(text);
}

void NotifyOnError(boost::shared_ptr<ErrorCallback> const& callback) {
  sErrorCallbacks.Add(callback);
}

bool HasErrors() {
  ovracore::LockGuard<ovracore::Mutex> lock(sErrorInfoMutex);
  return !sErrorInfos.empty();
}

std::vector<ErrorInfo> GetErrorInfos() {
  ovracore::LockGuard<ovracore::Mutex> lock(sErrorInfoMutex);
  return sErrorInfos;
}

void ClearErrorList() {
  ovracore::LockGuard<ovracore::Mutex> lock(sErrorInfoMutex);
  sErrorInfos.clear();
}

void DeleteEmptyErrorCallbacks() { sErrorCallbacks.DeleteEmptyFunctions(); }

void ClearErrorCallbacks() { sErrorCallbacks.Clear(); }

}  // namespace ovrametadata
