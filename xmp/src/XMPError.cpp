#include <ovraxmp/XMPError.h>

#include <utility>

#include "XMPPacket.h"

namespace ovraxmp {

const char* ErrorText(std::int32_t id) {
  switch (id) {
    case kXMPErr_Unknown: return "unknown error";
    case kXMPErr_TBD: return "feature not yet available";
    case kXMPErr_Unavailable: return "feature not available";
    case kXMPErr_BadObject: return "bad object (no packet or closed file)";
    case kXMPErr_BadParam: return "bad parameter";
    case kXMPErr_BadValue: return "bad value";
    case kXMPErr_AssertFailure: return "assertion failure";
    case kXMPErr_EnforceFailure: return "enforcement failure";
    case kXMPErr_Unimplemented: return "not implemented";
    case kXMPErr_InternalFailure: return "internal failure";
    case kXMPErr_Deprecated: return "deprecated call";
    case kXMPErr_ExternalFailure: return "external failure";
    case kXMPErr_UserAbort: return "user abort";
    case kXMPErr_StdException: return "standard exception";
    case kXMPErr_UnknownException: return "unknown exception";
    case kXMPErr_NoMemory: return "out of memory";
    case kXMPErr_BadSchema: return "bad schema: unregistered namespace URI";
    case kXMPErr_BadXPath: return "bad property path";
    case kXMPErr_BadOptions: return "bad option flags";
    case kXMPErr_BadIndex: return "bad array index";
    case kXMPErr_BadIterPosition: return "bad iteration position";
    case kXMPErr_BadParse: return "XMP parsing failure";
    case kXMPErr_BadSerialize: return "XMP serialisation failure";
    case kXMPErr_BadFileFormat: return "bad file format";
    case kXMPErr_NoFileHandler: return "no file handler for the format";
    case kXMPErr_TooLargeForJPEG: return "XMP too large for JPEG";
    case kXMPErr_BadXML: return "XML parsing failure";
    case kXMPErr_BadRDF: return "bad RDF";
    case kXMPErr_BadXMP: return "bad XMP data model";
    case kXMPErr_EmptyIterator: return "empty iterator";
    case kXMPErr_BadUnicode: return "bad Unicode";
    case kXMPErr_BadTIFF: return "bad TIFF";
    case kXMPErr_BadJPEG: return "bad JPEG";
    case kXMPErr_BadPSD: return "bad Photoshop file";
    case kXMPErr_BadPSIR: return "bad Photoshop image resource";
    case kXMPErr_BadIPTC: return "bad IPTC";
    case kXMPErr_BadMPEG: return "bad MPEG";
    default: return "unknown error";
  }
}

XMP_Error::XMP_Error(std::int32_t id, std::string message)
    : mID(id), mMessage(std::move(message)) {
  if (mMessage.empty()) mMessage = ErrorText(id);
}

namespace detail {

void Throw(std::int32_t id, const std::string& context) {
  std::string message = ErrorText(id);
  if (!context.empty()) message = context + ": " + message;
  throw XMP_Error(id, std::move(message));
}

void ThrowLastError(std::int32_t fallbackId, const std::string& context) {
  const int id = xmp_get_error();
  Throw(id != 0 ? id : fallbackId, context);
}

}  // namespace detail
}  // namespace ovraxmp
