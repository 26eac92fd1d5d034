// ovraxmp: the one exception type of the XMP toolkit layer and its ids.
#pragma once

#include <cstdint>
#include <exception>
#include <string>

namespace ovraxmp {

// Error ids, numerically those of the underlying toolkit.
constexpr std::int32_t kXMPErr_Unknown = 0;
constexpr std::int32_t kXMPErr_TBD = -1;
constexpr std::int32_t kXMPErr_Unavailable = -2;
constexpr std::int32_t kXMPErr_BadObject = -3;
constexpr std::int32_t kXMPErr_BadParam = -4;
constexpr std::int32_t kXMPErr_BadValue = -5;
constexpr std::int32_t kXMPErr_AssertFailure = -6;
constexpr std::int32_t kXMPErr_EnforceFailure = -7;
constexpr std::int32_t kXMPErr_Unimplemented = -8;
constexpr std::int32_t kXMPErr_InternalFailure = -9;
constexpr std::int32_t kXMPErr_Deprecated = -10;
constexpr std::int32_t kXMPErr_ExternalFailure = -11;
constexpr std::int32_t kXMPErr_UserAbort = -12;
constexpr std::int32_t kXMPErr_StdException = -13;
constexpr std::int32_t kXMPErr_UnknownException = -14;
constexpr std::int32_t kXMPErr_NoMemory = -15;
constexpr std::int32_t kXMPErr_BadSchema = -101;
constexpr std::int32_t kXMPErr_BadXPath = -102;
constexpr std::int32_t kXMPErr_BadOptions = -103;
constexpr std::int32_t kXMPErr_BadIndex = -104;
constexpr std::int32_t kXMPErr_BadIterPosition = -105;
constexpr std::int32_t kXMPErr_BadParse = -106;
constexpr std::int32_t kXMPErr_BadSerialize = -107;
constexpr std::int32_t kXMPErr_BadFileFormat = -108;
constexpr std::int32_t kXMPErr_NoFileHandler = -109;
constexpr std::int32_t kXMPErr_TooLargeForJPEG = -110;
constexpr std::int32_t kXMPErr_BadXML = -201;
constexpr std::int32_t kXMPErr_BadRDF = -202;
constexpr std::int32_t kXMPErr_BadXMP = -203;
constexpr std::int32_t kXMPErr_EmptyIterator = -204;
constexpr std::int32_t kXMPErr_BadUnicode = -205;
constexpr std::int32_t kXMPErr_BadTIFF = -206;
constexpr std::int32_t kXMPErr_BadJPEG = -207;
constexpr std::int32_t kXMPErr_BadPSD = -208;
constexpr std::int32_t kXMPErr_BadPSIR = -209;
constexpr std::int32_t kXMPErr_BadIPTC = -210;
constexpr std::int32_t kXMPErr_BadMPEG = -211;

// Raised by every failing operation of the layer. The message is English
// and never empty; an empty message given to the constructor is replaced by
// the standard text of the id.
class XMP_Error : public std::exception {
 public:
  XMP_Error(std::int32_t id, std::string message);
  std::int32_t GetID() const { return mID; }
  const char* GetErrMsg() const { return mMessage.c_str(); }
  const char* what() const noexcept override { return mMessage.c_str(); }

 private:
  std::int32_t mID;
  std::string mMessage;
};

// The standard English text of an error id ("unknown error" for ids the
// toolkit does not define).
const char* ErrorText(std::int32_t id);

}  // namespace ovraxmp
