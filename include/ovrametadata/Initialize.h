// ovrametadata: start-up and shutdown, error reporting, global switches and
// the folders the library reads from.
#pragma once

#include <vector>

#include <boost/function.hpp>
#include <boost/shared_ptr.hpp>

#include <ovrametadata/Common.h>

namespace ovrametadata {

// ---------------------------------------------------------------------------
// Start-up and shutdown

// Starts the XMP toolkit and loads the built-in and custom definitions.
// Calls are counted: only the first one does work, every further call only
// increments the count. Throws the toolkit's error when the toolkit cannot
// start (the call is then not counted); problems in definitions are reported
// through SendError instead. Call from one thread, before any other use.
OVRAMETADATA_EXPORT void Initialize();

// Undoes one Initialize. The last one empties every table (definitions,
// errors, callbacks) and stops the toolkit; a later Initialize loads
// everything again. Calls must be paired with Initialize.
OVRAMETADATA_EXPORT void Terminate();

// The version texts of the toolkit core and of its file handlers, asked once
// and kept for later calls. Empty when the toolkit does not say.
OVRAMETADATA_EXPORT UTF8String GetXMPCoreVersion();
OVRAMETADATA_EXPORT UTF8String GetXMPFilesVersion();

// ---------------------------------------------------------------------------
// Error reporting

// What kind of operation failed. Each kind has its own localised format with
// the reporter's message in place of "@0"; kPlainError uses the message as
// it stands.
enum ErrorType : int {
  kDefinitionParsingError = 0,
  kDefinitionRegistrationError = 1,
  kErrorReadingXMP = 2,
  kErrorWritingXMP = 3,
  kViewDefinitionParsingError = 4,
  kViewDefinitionRegistrationError = 5,
  kPlainError = 6,
  kExtensionManifestParsingError = 7,
  kExtensionPackageRegistrationError = 8
};

struct ErrorInfo {
  ErrorType type = kPlainError;
  UTF16String message;  // formatted, localised text
  UTF16String source;   // file path or other source name; may be empty
};

using ErrorCallback = boost::function<void(UTF16String const&)>;
using XMPWritingChangedCallback = boost::function<void()>;

// Formats the localised text of `type` with `message`, records it with
// `source` and calls every error callback that is still set with the text.
// Any thread may report; callbacks run on the reporting thread, outside the
// lock, so they may call GetErrorInfos. A type without a format (above 8)
// records an empty text.
OVRAMETADATA_EXPORT void SendError(ErrorType type, UTF16String const& message,
                                   UTF16String const& source);

// Adds an error callback. The library shares the callable with the caller;
// clearing it (`callback->clear()`) withdraws the callback, and cleared
// entries are dropped on the next registration. A null pointer is ignored
// when called. Register from the client's main thread.
OVRAMETADATA_EXPORT void NotifyOnError(boost::shared_ptr<ErrorCallback> const& callback);

// Whether any error was recorded since start-up (thread-safe).
OVRAMETADATA_EXPORT bool HasErrors();

// A copy of every recorded error in reporting order (thread-safe). Reading
// does not clear the list; only the last Terminate does.
OVRAMETADATA_EXPORT std::vector<ErrorInfo> GetErrorInfos();

// ---------------------------------------------------------------------------
// Global switches (set from the client's main thread)

// Disables or enables writing of XMP by the providers. A change calls every
// writing-changed callback that is still set, once, in registration order;
// setting the current value again calls nothing.
OVRAMETADATA_EXPORT void DisableXMPWriting(bool disabled);
OVRAMETADATA_EXPORT bool IsXMPWritingDisabled();
// Adds a writing-changed callback; withdrawn like an error callback.
OVRAMETADATA_EXPORT void NotifyWhenXMPWritingChanged(
    boost::shared_ptr<XMPWritingChangedCallback> const& callback);

// Debug setting that treats all metadata as writable. Kept in the debug
// database under "ForceMetadataWritable", so it can also be set from
// outside the library; only the exact value "true" switches it on.
OVRAMETADATA_EXPORT void ForcedAllMetadataWritable(bool force);
OVRAMETADATA_EXPORT bool IsAllMetadataForcedWritable();

// ---------------------------------------------------------------------------
// Folders. Every function answers a full path, or an empty string when the
// data root cannot be determined; none of them creates the folder.

// The generation of the metadata-panel folder layout. The underlying type is
// fixed because callers may pass other values (they mean the oldest layout).
enum VelkVersion : int { kPanelsVersion4 = 0, kPanelsVersion3 = 1, kPanelsVersion2 = 2 };

// Custom definitions files of the machine and of the current user.
OVRAMETADATA_EXPORT UTF16String CustomDefinitionsGlobalDirectory();
OVRAMETADATA_EXPORT UTF16String CustomDefinitionsUserDirectory();
// Metadata-panel folders of the user and of the machine; any version other
// than kPanelsVersion4 and kPanelsVersion3 gives the 2.0 layout.
OVRAMETADATA_EXPORT UTF16String PanelsDefinitionsUserDirectory(VelkVersion version);
OVRAMETADATA_EXPORT UTF16String PanelsDefinitionsGlobalDirectory(VelkVersion version);
// The toolkit's file-handler plug-ins, below the application's plug-in folder.
OVRAMETADATA_EXPORT UTF16String XMPFilesPluginsDirectory();
// True for the file names never loaded from the machine-wide custom folder
// ("DICOM.xml" and "Mobile.xml", case-sensitive).
OVRAMETADATA_EXPORT bool IsSchemaExcludedFromGlobal(UTF16String const& fileName);

}  // namespace ovrametadata
