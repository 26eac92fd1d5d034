// Private to the library, not part of the interface: path resolution steps
// that reuse an entry definition already looked up, and the lazy ranges of
// paths handed out by ChildPaths and DescendantLeafPaths.
#pragma once

#include <cstddef>

#include <boost/iterator/iterator_facade.hpp>
#include <boost/optional.hpp>
#include <boost/shared_ptr.hpp>

#include <ovrametadata/Definitions.h>
#include <ovrametadata/Paths.h>

namespace ovrametadata {
namespace detail {

// The steps of PrimitiveTypeOfPath, IsPathAnArray and TypeEntryDefinition on
// an entry that was resolved from path already.
boost::optional<PrimitiveType> PrimitiveTypeOfEntry(const EntryDefinition& entry);
bool IsEntryAnArray(const Path& path, const EntryDefinition& entry, bool force);
boost::shared_ptr<TypeDefinition> TypeOfEntry(const Path& path, const EntryDefinition& entry);
// The structure type whose fields CreatePathFromArrayedStructureField
// composes on itemPath; null when there is none.
boost::shared_ptr<TypeDefinition> ArrayedStructureType(const Path& itemPath);

// A sequence of paths computed on demand by index.
class PathSource {
 public:
  virtual ~PathSource() = default;
  virtual std::size_t Count() const = 0;
  virtual Path At(std::size_t index) const = 0;
};

// Iterator over a PathSource; it shares the source, so ranges made of it
// stay valid after the call that made them.
class PathSourceIterator
    : public boost::iterator_facade<PathSourceIterator, Path, boost::bidirectional_traversal_tag,
                                     Path> {
 public:
  PathSourceIterator() = default;
  PathSourceIterator(boost::shared_ptr<const PathSource> source, std::size_t index)
      : mSource(std::move(source)), mIndex(index) {}

 private:
  friend class boost::iterator_core_access;
  Path dereference() const { return mSource->At(mIndex); }
  bool equal(const PathSourceIterator& other) const { return mIndex == other.mIndex; }
  void increment() { ++mIndex; }
  void decrement() { --mIndex; }

  boost::shared_ptr<const PathSource> mSource;
  std::size_t mIndex = 0;
};

Range<Path> MakeRange(const boost::shared_ptr<const PathSource>& source);

// The children of path as a source, with the type whose fields they are
// (null for the single element child of an array). Null when path is a
// leaf.
boost::shared_ptr<const PathSource> ChildSource(const Path& path,
                                                boost::shared_ptr<TypeDefinition>* type);

}  // namespace detail
}  // namespace ovrametadata
