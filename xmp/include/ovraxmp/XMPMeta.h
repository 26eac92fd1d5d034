// ovraxmp: the XMP packet holder and the process-wide toolkit functions.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include <ovrametadata/XMPMetaRef.h>
#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>

namespace ovraxmp {

// A value read from a packet, with the bits that tell its kind
// (kXMP_PropValueIsStruct, kXMP_PropArrayIsAltText, ...). Structures and
// arrays have an empty value.
struct XMP_Node {
  std::string value;
  XMP_OptionBits options = 0;
};

// The item of a language alternative that a choice of languages picked.
struct XMP_LocalizedNode {
  std::string language;
  std::string value;
  XMP_OptionBits options = 0;
};

// Called by the toolkit for internal assertions; the layer accepts and keeps
// the registration (the underlying toolkit raises none).
using XMP_AssertNotifyProc = void (*)(void* refCon, const char* message);

// RAII holder of one reference to a packet. All operations throw XMP_Error
// on failure; reads of absent properties answer false instead of throwing.
// A holder without packet (built from a null handle) throws kXMPErr_BadObject
// from every operation that needs one. One packet must not be used from two
// threads at once; different packets may.
class XMPMeta {
 public:
  // A new, empty packet.
  XMPMeta();
  // Adds a reference to ref; a null ref gives a holder without packet.
  explicit XMPMeta(XMPMetaRef ref);
  XMPMeta(const XMPMeta& other);
  XMPMeta(XMPMeta&& other) noexcept;
  XMPMeta& operator=(const XMPMeta& other);
  XMPMeta& operator=(XMPMeta&& other) noexcept;
  ~XMPMeta();

  // The handle, without adding a reference; null when there is no packet.
  XMPMetaRef GetInternalRef() const { return mRef; }

  // ---- Whole packet ----
  // Parses the whole buffer into this packet, replacing its content (and
  // its multi-value marks). Without kXMP_RequireXMPMeta a bare rdf:RDF
  // element is accepted too. Throws kXMPErr_BadXML / kXMPErr_BadRDF /
  // kXMPErr_BadXMP for malformed input; an empty buffer gives an empty packet.
  void ParseFromBuffer(const char* buffer, std::size_t length, XMP_OptionBits options = 0);
  void ParseFromBuffer(const std::string& buffer, XMP_OptionBits options = 0);
  // Serialises into *out (replaced). Empty newline/indent and zero padding
  // mean the toolkit defaults ("\n", three blanks, 2048 bytes of padding).
  // The transient namespace is never written.
  std::string SerializeToBuffer(XMP_OptionBits options = 0, std::uint32_t padding = 0,
                                const std::string& newline = std::string(),
                                const std::string& indent = std::string(), std::int32_t baseIndent = 0) const;
  // A new packet with a deep copy of the properties and the multi-value marks.
  XMPMeta Clone(XMP_OptionBits options = 0) const;
  // Removes every property and mark; the handle stays the same packet.
  void Erase();

  // ---- Properties (propName is a toolkit path relative to schemaNS) ----
  // Nothing when absent, also for an unregistered namespace.
  std::optional<XMP_Node> GetProperty(const std::string& schemaNS, const std::string& propName) const;
  // Creates or replaces the property; options with a composite bit create an
  // empty struct or array. Throws kXMPErr_BadSchema for an unregistered
  // namespace and kXMPErr_BadXPath for a text value on an existing struct or
  // array (unless kXMP_DeleteExisting replaces it).
  void SetProperty(const std::string& schemaNS, const std::string& propName,
                   const std::string& propValue, XMP_OptionBits options = 0);
  // Deleting an absent property does nothing.
  void DeleteProperty(const std::string& schemaNS, const std::string& propName);
  bool DoesPropertyExist(const std::string& schemaNS, const std::string& propName) const;

  // Typed forms. Getters give nothing when absent and throw kXMPErr_BadValue
  // when the text does not convert; setters store the XMPUtils text form.
  std::optional<bool> GetProperty_Bool(const std::string& schemaNS, const std::string& propName) const;
  std::optional<std::int32_t> GetProperty_Int(const std::string& schemaNS, const std::string& propName) const;
  std::optional<std::int64_t> GetProperty_Int64(const std::string& schemaNS, const std::string& propName) const;
  std::optional<double> GetProperty_Float(const std::string& schemaNS, const std::string& propName) const;
  void SetProperty_Bool(const std::string& schemaNS, const std::string& propName, bool propValue,
                        XMP_OptionBits options = 0);
  void SetProperty_Int(const std::string& schemaNS, const std::string& propName,
                       std::int32_t propValue, XMP_OptionBits options = 0);
  void SetProperty_Int64(const std::string& schemaNS, const std::string& propName,
                         std::int64_t propValue, XMP_OptionBits options = 0);
  void SetProperty_Float(const std::string& schemaNS, const std::string& propName,
                         double propValue, XMP_OptionBits options = 0);
  void SetProperty_Date(const std::string& schemaNS, const std::string& propName,
                        const XMP_DateTime& propValue, XMP_OptionBits options = 0);

  // ---- Arrays (1-based indices; kXMP_ArrayLastItem = -1 is the last item) ----
  // Absent array or item: nothing. A property that is not an array raises
  // kXMPErr_BadXPath; an index of 0 or below -1 raises kXMPErr_BadIndex.
  std::optional<XMP_Node> GetArrayItem(const std::string& schemaNS, const std::string& arrayName,
                                       XMP_Index itemIndex) const;
  // Replaces the item, or inserts a new one before or after it with
  // kXMP_InsertBeforeItem / kXMP_InsertAfterItem; index count+1 appends.
  void SetArrayItem(const std::string& schemaNS, const std::string& arrayName, XMP_Index itemIndex,
                    const std::string& itemValue, XMP_OptionBits options = 0);
  // Appends an item, creating the array with arrayOptions when absent.
  void AppendArrayItem(const std::string& schemaNS, const std::string& arrayName,
                       XMP_OptionBits arrayOptions, const std::string& itemValue,
                       XMP_OptionBits options = 0);
  void DeleteArrayItem(const std::string& schemaNS, const std::string& arrayName, XMP_Index itemIndex);
  // 0 for an absent array; kXMPErr_BadXPath when the property is not one.
  XMP_Index CountArrayItems(const std::string& schemaNS, const std::string& arrayName) const;

  // ---- Struct fields and qualifiers ----
  // The field / qualifier namespace must be registered (kXMPErr_BadSchema).
  std::optional<XMP_Node> GetStructField(const std::string& schemaNS, const std::string& structName,
                                         const std::string& fieldNS, const std::string& fieldName) const;
  void SetStructField(const std::string& schemaNS, const std::string& structName,
                      const std::string& fieldNS, const std::string& fieldName,
                      const std::string& fieldValue, XMP_OptionBits options = 0);

  // ---- Localised text (language alternatives) ----
  // Chooses by the XMP rules: the specific language, else the first item of
  // the generic language, else "x-default", else the first item. Nothing when
  // the property is absent or empty; kXMPErr_BadXPath when it is not alt-text.
  std::optional<XMP_LocalizedNode> GetLocalizedText(const std::string& schemaNS, const std::string& altTextName,
                                                    const std::string& genericLang,
                                                    const std::string& specificLang) const;
  // Sets the item of specificLang (creating the alt-text array) and keeps
  // "x-default" in step as the XMP rules say.
  void SetLocalizedText(const std::string& schemaNS, const std::string& altTextName,
                        const std::string& genericLang, const std::string& specificLang,
                        const std::string& itemValue, XMP_OptionBits options = 0);
  void DeleteLocalizedText(const std::string& schemaNS, const std::string& altTextName,
                           const std::string& genericLang, const std::string& specificLang);

  // ---- Multi-value marks (in memory only) ----
  // True when the path or one of its ancestors is marked.
  bool IsMultiValued(const std::string& schemaNS, const std::string& propPath) const;
  void SetMultiValued(const std::string& schemaNS, const std::string& propPath);
  // Removes the marks of the path and of its descendants; an empty path
  // clears the whole namespace.
  void ClearMultiValueInfo(const std::string& schemaNS, const std::string& propPath);

  // ---- Process-wide start and stop (counted; thread-safe) ----
  // Starts the toolkit on the first call; throws XMP_Error when it fails.
  static bool Initialize();
  // Stops the toolkit when the count drops to zero; extra calls are ignored.
  static void Terminate();
  // The core's version text, e.g. "Exempi + XMP Core 6.0.0".
  static std::string GetVersionInfo();
  // The application name used for history events (softwareAgent).
  static void SetClientName(const std::string& name);
  static std::string GetClientName();
  // Records an assertion callback; a null proc unregisters it.
  static void RegisterAssertNotify(XMP_AssertNotifyProc proc, void* refCon);

  // ---- Namespace registry (process-wide) ----
  // Registers namespaceURI with suggestedPrefix (with or without trailing
  // colon). Answers true when the namespace is (now or already) registered
  // under that prefix, false when it got another prefix because the
  // suggested one was taken or the namespace already had one. The prefix in
  // use, with its trailing colon, goes to registeredPrefix when non-null.
  // Throws kXMPErr_BadParam for an empty URI or an invalid prefix.
  static bool RegisterNamespace(const std::string& namespaceURI,
                                const std::string& suggestedPrefix,
                                std::string* registeredPrefix);
  // The prefix with trailing colon ("dc:"); nothing when the namespace is
  // not registered.
  static std::optional<std::string> GetNamespacePrefix(const std::string& namespaceURI);

 private:
  XMPMetaRef mRef = nullptr;
};

// Reference counting for code that keeps raw handles; both accept null.
void XMPMetaRefAddRef(XMPMetaRef ref);
void XMPMetaRefRelease(XMPMetaRef ref);
// The number of references held on ref (0 for null); for diagnostics and
// tests, since other threads may change it at any time.
std::int32_t XMPMetaRefGetCount(XMPMetaRef ref);

}  // namespace ovraxmp
