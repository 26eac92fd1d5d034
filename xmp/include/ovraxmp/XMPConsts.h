// ovraxmp: option bits, well-known namespaces and the date-time record of
// the XMP toolkit layer. The numeric values are the toolkit's own.
#pragma once

#include <cstdint>

#include <ovrametadata/XMPMetaRef.h>

namespace ovraxmp {

using XMP_OptionBits = std::uint32_t;
using XMP_Index = std::int32_t;

// Property option bits (also the item and array options of array functions).
constexpr XMP_OptionBits kXMP_NoOptions = 0;
constexpr XMP_OptionBits kXMP_PropValueIsURI = 0x2;
constexpr XMP_OptionBits kXMP_PropHasQualifiers = 0x10;
constexpr XMP_OptionBits kXMP_PropIsQualifier = 0x20;
constexpr XMP_OptionBits kXMP_PropHasLang = 0x40;
constexpr XMP_OptionBits kXMP_PropHasType = 0x80;
constexpr XMP_OptionBits kXMP_PropValueIsStruct = 0x100;
constexpr XMP_OptionBits kXMP_PropValueIsArray = 0x200;
constexpr XMP_OptionBits kXMP_PropArrayIsUnordered = kXMP_PropValueIsArray;
constexpr XMP_OptionBits kXMP_PropArrayIsOrdered = 0x400;
constexpr XMP_OptionBits kXMP_PropArrayIsAlternate = 0x800;
constexpr XMP_OptionBits kXMP_PropArrayIsAltText = 0x1000;
constexpr XMP_OptionBits kXMP_InsertBeforeItem = 0x4000;
constexpr XMP_OptionBits kXMP_InsertAfterItem = 0x8000;
constexpr XMP_OptionBits kXMP_PropIsAlias = 0x10000;
constexpr XMP_OptionBits kXMP_PropHasAliases = 0x20000;
constexpr XMP_OptionBits kXMP_PropIsInternal = 0x40000;
constexpr XMP_OptionBits kXMP_PropIsStable = 0x100000;
constexpr XMP_OptionBits kXMP_PropIsDerived = 0x200000;
constexpr XMP_OptionBits kXMP_PropArrayFormMask = 0x1E00;
constexpr XMP_OptionBits kXMP_PropCompositeMask = 0x1F00;
constexpr XMP_OptionBits kXMP_DeleteExisting = 0x20000000;
constexpr XMP_OptionBits kXMP_SchemaNode = 0x80000000;

// The array index that names the last item.
constexpr XMP_Index kXMP_ArrayLastItem = -1;

// Iteration options and skip options.
constexpr XMP_OptionBits kXMP_IterProperties = 0x0;
constexpr XMP_OptionBits kXMP_IterJustChildren = 0x100;
constexpr XMP_OptionBits kXMP_IterJustLeafNodes = 0x200;
constexpr XMP_OptionBits kXMP_IterJustLeafName = 0x400;
constexpr XMP_OptionBits kXMP_IterOmitQualifiers = 0x1000;
constexpr XMP_OptionBits kXMP_IterSkipSubtree = 0x1;
constexpr XMP_OptionBits kXMP_IterSkipSiblings = 0x2;

// Serialisation options.
constexpr XMP_OptionBits kXMP_OmitPacketWrapper = 0x10;
constexpr XMP_OptionBits kXMP_ReadOnlyPacket = 0x20;
constexpr XMP_OptionBits kXMP_UseCompactFormat = 0x40;
constexpr XMP_OptionBits kXMP_IncludeThumbnailPad = 0x100;
constexpr XMP_OptionBits kXMP_ExactPacketLength = 0x200;
constexpr XMP_OptionBits kXMP_OmitAllFormatting = 0x800;
constexpr XMP_OptionBits kXMP_OmitXMPMetaElement = 0x1000;
constexpr XMP_OptionBits kXMP_EncodingMask = 0x7;
constexpr XMP_OptionBits kXMP_EncodeUTF8 = 0x0;

// Parse options.
constexpr XMP_OptionBits kXMP_RequireXMPMeta = 0x1;
constexpr XMP_OptionBits kXMP_ParseMoreBuffers = 0x2;
constexpr XMP_OptionBits kXMP_StrictAliasing = 0x4;

// Catenate / separate options.
constexpr XMP_OptionBits kXMPUtil_AllowCommas = 0x10000000;

// Template flags.
constexpr XMP_OptionBits kXMPTemplate_NoOptions = 0x0;
constexpr XMP_OptionBits kXMPTemplate_ClearUnnamedProperties = 0x02;
constexpr XMP_OptionBits kXMPTemplate_AddNewProperties = 0x04;
constexpr XMP_OptionBits kXMPTemplate_ReplaceWithDeleteEmpty = 0x08;
constexpr XMP_OptionBits kXMPTemplate_ReplaceExistingProperties = 0x10;
constexpr XMP_OptionBits kXMPTemplate_IncludeInternalProperties = 0x20;

// AppendProperties options.
constexpr XMP_OptionBits kXMPUtil_DoAllProperties = 0x1;
constexpr XMP_OptionBits kXMPUtil_ReplaceOldValues = 0x2;
constexpr XMP_OptionBits kXMPUtil_DeleteEmptyValues = 0x4;
constexpr XMP_OptionBits kXMPUtil_IncludeAliases = 0x800;

// File open options.
constexpr XMP_OptionBits kXMPFiles_OpenForRead = 0x1;
constexpr XMP_OptionBits kXMPFiles_OpenForUpdate = 0x2;
constexpr XMP_OptionBits kXMPFiles_OpenOnlyXMP = 0x4;
constexpr XMP_OptionBits kXMPFiles_ForceGivenHandler = 0x8;
constexpr XMP_OptionBits kXMPFiles_OpenStrictly = 0x10;
constexpr XMP_OptionBits kXMPFiles_OpenUseSmartHandler = 0x20;
constexpr XMP_OptionBits kXMPFiles_OpenUsePacketScanning = 0x40;
constexpr XMP_OptionBits kXMPFiles_OpenLimitedScanning = 0x80;
constexpr XMP_OptionBits kXMPFiles_OpenRepairFile = 0x100;
constexpr XMP_OptionBits kXMPFiles_OptimizeFileLayout = 0x200;
constexpr XMP_OptionBits kXMPFiles_OpenAllowBackgroundFileOpen = 0x400;
// Close options.
constexpr XMP_OptionBits kXMPFiles_NoOptions = 0x0;
constexpr XMP_OptionBits kXMPFiles_UpdateSafely = 0x1;

// Handler (format) flags, as GetFormatInfo and GetFileInfo report them.
constexpr XMP_OptionBits kXMPFiles_CanInjectXMP = 0x1;
constexpr XMP_OptionBits kXMPFiles_CanExpand = 0x2;
constexpr XMP_OptionBits kXMPFiles_CanRewrite = 0x4;
constexpr XMP_OptionBits kXMPFiles_PrefersInPlace = 0x8;
constexpr XMP_OptionBits kXMPFiles_CanReconcile = 0x10;
constexpr XMP_OptionBits kXMPFiles_AllowsOnlyXMP = 0x20;
constexpr XMP_OptionBits kXMPFiles_ReturnsRawPacket = 0x40;
constexpr XMP_OptionBits kXMPFiles_HandlerOwnsFile = 0x100;
constexpr XMP_OptionBits kXMPFiles_AllowsSafeUpdate = 0x200;
constexpr XMP_OptionBits kXMPFiles_NeedsReadOnlyPacket = 0x400;
constexpr XMP_OptionBits kXMPFiles_UsesSidecarXMP = 0x800;
constexpr XMP_OptionBits kXMPFiles_FolderBasedFormat = 0x1000;

// File formats (four-character codes, big-endian).
constexpr XMP_FileFormat kXMP_UnknownFile = 0x20202020;
constexpr XMP_FileFormat kXMP_PDFFile = 0x50444620;
constexpr XMP_FileFormat kXMP_JPEGFile = 0x4A504547;
constexpr XMP_FileFormat kXMP_TIFFFile = 0x54494646;
constexpr XMP_FileFormat kXMP_GIFFile = 0x47494620;
constexpr XMP_FileFormat kXMP_PNGFile = 0x504E4720;
constexpr XMP_FileFormat kXMP_MOVFile = 0x4D4F5620;
constexpr XMP_FileFormat kXMP_AVIFile = 0x41564920;
constexpr XMP_FileFormat kXMP_WAVFile = 0x57415620;
constexpr XMP_FileFormat kXMP_MP3File = 0x4D503320;
constexpr XMP_FileFormat kXMP_MPEG4File = 0x4D503420;
constexpr XMP_FileFormat kXMP_AIFFFile = 0x41494646;
constexpr XMP_FileFormat kXMP_XMLFile = 0x584D4C20;
constexpr XMP_FileFormat kXMP_PhotoshopFile = 0x50534420;

// Well-known namespace URIs.
constexpr const char kXMP_NS_XMP[] = "http://ns.adobe.com/xap/1.0/";
constexpr const char kXMP_NS_XMP_Rights[] = "http://ns.adobe.com/xap/1.0/rights/";
constexpr const char kXMP_NS_XMP_MM[] = "http://ns.adobe.com/xap/1.0/mm/";
constexpr const char kXMP_NS_DC[] = "http://purl.org/dc/elements/1.1/";
constexpr const char kXMP_NS_EXIF[] = "http://ns.adobe.com/exif/1.0/";
constexpr const char kXMP_NS_TIFF[] = "http://ns.adobe.com/tiff/1.0/";
constexpr const char kXMP_NS_Photoshop[] = "http://ns.adobe.com/photoshop/1.0/";
constexpr const char kXMP_NS_IPTCCore[] = "http://iptc.org/std/Iptc4xmpCore/1.0/xmlns/";
constexpr const char kXMP_NS_DM[] = "http://ns.adobe.com/xmp/1.0/DynamicMedia/";
constexpr const char kXMP_NS_XML[] = "http://www.w3.org/XML/1998/namespace";
constexpr const char kXMP_NS_RDF[] = "http://www.w3.org/1999/02/22-rdf-syntax-ns#";
constexpr const char kXMP_NS_XMP_ResourceEvent[] = "http://ns.adobe.com/xap/1.0/sType/ResourceEvent#";
constexpr const char kXMP_NS_XMP_ResourceRef[] = "http://ns.adobe.com/xap/1.0/sType/ResourceRef#";
// Data that lives only in memory: never serialised, never written to files.
constexpr const char kXMP_NS_Transient[] = "http://ns.adobe.com/xmp/transient/1.0/";
constexpr const char kXMP_NS_XMP_Transient[] = "http://ns.adobe.com/xmp/transient/1.0/";
constexpr const char kXMP_NS_Transient_Prefix[] = "xmpx";

// A date, a time or both, as XMP allows them. Fields that the flags say are
// absent are zero.
struct XMP_DateTime {
  std::int32_t year = 0;
  std::int32_t month = 0;   // 1..12
  std::int32_t day = 0;     // 1..31
  std::int32_t hour = 0;    // 0..23
  std::int32_t minute = 0;  // 0..59
  std::int32_t second = 0;  // 0..59
  bool hasDate = false;
  bool hasTime = false;
  bool hasTimeZone = false;
  std::int8_t tzSign = 0;  // -1 west of UTC, 0 UTC, +1 east
  std::int32_t tzHour = 0;
  std::int32_t tzMinute = 0;
  std::int32_t nanoSecond = 0;
};
constexpr std::int8_t kXMP_TimeWestOfUTC = -1;
constexpr std::int8_t kXMP_TimeIsUTC = 0;
constexpr std::int8_t kXMP_TimeEastOfUTC = 1;

}  // namespace ovraxmp
