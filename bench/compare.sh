#!/usr/bin/env bash
# Times ovrameta against the tools people use today, on one corpus, in one run:
# reading one property from all files, showing all metadata of all files and
# setting one property on all files, for ovrameta, ExifTool (one process,
# -fast) and the exiv2 tool. Prints files per second and the ratios.
#
#   bench/compare.sh                  300 JPEGs and 50 MP4s
#   JPEGS=30 MP4S=5 bench/compare.sh  a quick look
#   OVRAMETA=path/to/ovrameta bench/compare.sh   use that build instead of build/
#                                     (its bench/set_floor too, when built)
#   RUNS=3                            best of RUNS timings (default 3)
#
# The corpus is made with ExifTool in a temporary folder, from the bundled
# samples, with realistic XMP that differs partly from file to file.
#
# A last row times bench/set_floor: each file read as the library's file
# provider reads it and its packet put back at its own place, straight into
# the file, without the safe write, the sync, the aggregate or any check. It
# shows how fast setting can get on this machine.
set -euo pipefail
cd "$(dirname "$0")/.."
root=$(pwd)

JPEGS=${JPEGS:-300}
MP4S=${MP4S:-50}
RUNS=${RUNS:-3}

# ---------------------------------------------------------------- tools
install_missing() {
  local sudo_cmd=""
  [ "$(id -u)" -eq 0 ] || sudo_cmd="sudo"
  $sudo_cmd apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $sudo_cmd apt-get install -y -qq --no-install-recommends "$@"
}
command -v exiv2 >/dev/null || install_missing exiv2
if [ -z "${OVRAMETA:-}" ]; then
  scripts/deps
  cmake -S . -B build -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
  cmake --build build -j "$(nproc 2>/dev/null || echo 2)" --target ovrameta set_floor >/dev/null
  OVRAMETA=$root/build/tools/ovrameta/ovrameta
fi
# The floor program of the same build: build/tools/ovrameta/ovrameta -> build/bench/set_floor.
if [ -z "${FLOOR:-}" ]; then
  FLOOR=$(cd "$(dirname "$OVRAMETA")/../.." 2>/dev/null && pwd)/bench/set_floor || true
fi
cores=$(nproc 2>/dev/null || echo 2)
command -v exiftool >/dev/null || { echo "compare.sh: exiftool is missing" >&2; exit 2; }

work=$(mktemp -d "${TMPDIR:-/tmp}/ovra-compare-XXXXXX")
trap 'rm -rf "$work"' EXIT
export LC_ALL=C.UTF-8 TZ=UTC
# ovrameta reads no user definitions during the benchmark.
export OVRAMETADATA_USER_ROOT=$work/user OVRAMETADATA_LOCAL_ROOT=$work/local

# ---------------------------------------------------------------- corpus
echo "Making the corpus: $JPEGS JPEGs and $MP4S MP4s in $work ..."
mkdir -p "$work/corpus"
cities=("San Francisco" "Oakland" "Lisbon" "Porto" "Hamburg" "Kiel" "Bergen")
countries=("United States" "United States" "Portugal" "Portugal" "Germany" "Germany" "Norway")
words=(harbour dawn boats pier gulls fog rope net crane tide ferry lighthouse)
args=$work/corpus.args
{
  for i in $(seq 1 "$JPEGS"); do
    f=$(printf "%s/corpus/img%04d.jpg" "$work" "$i")
    cp samples/harbour.jpg "$f"
    c=$((i % ${#cities[@]}))
    echo "-XMP-dc:Title=Harbour frame $i"
    echo "-XMP-dc:Description=Frame $i of the morning series, ${cities[$c]}."
    echo "-XMP-dc:Creator=Photographer $((i % 4 + 1))"
    echo "-XMP-dc:Subject=${words[$((i % 12))]}"
    echo "-XMP-dc:Subject=${words[$(((i * 7) % 12))]}"
    [ $((i % 3)) -eq 0 ] && echo "-XMP-dc:Subject=${words[$(((i * 5) % 12))]}"
    echo "-XMP-xmp:Rating=$((i % 6))"
    [ $((i % 4)) -eq 0 ] && echo "-XMP-xmp:Label=Selected"
    echo "-XMP-xmp:CreateDate=2024:05:$(printf %02d $((i % 28 + 1))) 06:$(printf %02d $((i % 60))):10"
    echo "-XMP-photoshop:City=${cities[$c]}"
    echo "-XMP-photoshop:Country=${countries[$c]}"
    echo "-XMP-exif:ExposureTime=1/$((125 * (i % 4 + 1)))"
    echo "-XMP-exif:FNumber=$((i % 5 + 2)).8"
    echo "-XMP-exif:ISO=$((100 * (i % 8 + 1)))"
    echo "-XMP-iptcCore:Location=Pier $((i % 9 + 1))"
    echo "$f"
    echo "-execute"
  done
  for i in $(seq 1 "$MP4S"); do
    f=$(printf "%s/corpus/clip%04d.mp4" "$work" "$i")
    cp samples/interview.mp4 "$f"
    echo "-XMP-dc:Title=Harbour clip $i"
    echo "-XMP-xmpDM:Scene=$((i % 12 + 1))"
    echo "-XMP-xmpDM:ShotName=Shot $i"
    echo "-XMP-xmpDM:TakeNumber=$((i % 5 + 1))"
    echo "-XMP-xmpDM:Good=$([ $((i % 2)) -eq 0 ] && echo True || echo False)"
    echo "-XMP-xmpDM:LogComment=Take $((i % 5 + 1)), camera $((i % 3 + 1))."
    echo "-XMP-xmpDM:Markers+={Name=Cue $i,StartTime=$((i * 25))}"
    echo "-XMP-xmp:Rating=$((i % 6))"
    echo "$f"
    echo "-execute"
  done
} >"$args"
exiftool -@ "$args" -common_args -overwrite_original -q >/dev/null
mapfile -t files < <(cd "$work/corpus" && ls)
count=${#files[@]}
echo "Corpus: $count files, $(du -sh "$work/corpus" | cut -f1)"

# ---------------------------------------------------------------- timing
now() { date +%s.%N; }

# best_of COMMAND...: the fastest of RUNS runs, in seconds, in the corpus folder.
best_of() {
  local best="" start end t
  for _ in $(seq 1 "$RUNS"); do
    start=$(now)
    (cd "$work/corpus" && "$@" >/dev/null 2>&1) || true
    end=$(now)
    t=$(echo "$end - $start" | bc -l)
    if [ -z "$best" ] || [ "$(echo "$t < $best" | bc -l)" -eq 1 ]; then best=$t; fi
  done
  echo "$best"
}

# best_write COMMAND...: like best_of, each run on a fresh copy of the corpus.
best_write() {
  local best="" start end t
  for _ in $(seq 1 "$RUNS"); do
    rm -rf "$work/copy"
    cp -a "$work/corpus" "$work/copy"
    start=$(now)
    (cd "$work/copy" && "$@" >/dev/null 2>&1) || true
    end=$(now)
    t=$(echo "$end - $start" | bc -l)
    if [ -z "$best" ] || [ "$(echo "$t < $best" | bc -l)" -eq 1 ]; then best=$t; fi
  done
  echo "$best"
}

command -v bc >/dev/null || install_missing bc

echo "Timing (best of $RUNS) ..."
read_o=$(best_of "$OVRAMETA" get "${files[@]}" dc:title)
read_e=$(best_of exiftool -fast -s3 -XMP-dc:Title "${files[@]}")
read_x=$(best_of exiv2 -q -K Xmp.dc.title -Pv pr "${files[@]}")

show_o=$(best_of "$OVRAMETA" show --each "${files[@]}")
show_e=$(best_of exiftool -fast "${files[@]}")
show_x=$(best_of exiv2 -q -pa pr "${files[@]}")

set_o=$(best_write "$OVRAMETA" set "${files[@]}" xmp:Label=Reviewed)
set_e=$(best_write exiftool -fast -overwrite_original -XMP-xmp:Label=Reviewed "${files[@]}")
set_x=$(best_write exiv2 -q -M "set Xmp.xmp.Label Reviewed" mo "${files[@]}")
set_f=""
[ -x "$FLOOR" ] && set_f=$(best_write "$FLOOR" "$cores" "${files[@]}")

# ---------------------------------------------------------------- checks
# Every tool must have done the work, or its speed means nothing.
rm -rf "$work/copy" && cp -a "$work/corpus" "$work/copy"
(cd "$work/copy" && "$OVRAMETA" set "${files[@]}" xmp:Label=Reviewed >/dev/null 2>&1) || true
written=$(cd "$work/copy" && exiftool -fast -s3 -XMP-xmp:Label "${files[@]}" 2>/dev/null | grep -c '^Reviewed$' || true)
exiv2_read=$(cd "$work/corpus" && exiv2 -q -K Xmp.dc.title -Pv pr "${files[@]}" 2>/dev/null | grep -c 'Harbour' || true)

rate() { echo "scale=1; $count / $1" | bc -l; }
ratio() { echo "scale=1; $2 / $1" | bc -l; }

echo
printf "%-34s %12s %12s %12s %14s %12s\n" "files per second ($count files)" "ovrameta" "ExifTool" "exiv2" "vs ExifTool" "vs exiv2"
printf "%-34s %12s %12s %12s %13sx %11sx\n" "read one property" "$(rate "$read_o")" "$(rate "$read_e")" "$(rate "$read_x")" "$(ratio "$read_o" "$read_e")" "$(ratio "$read_o" "$read_x")"
printf "%-34s %12s %12s %12s %13sx %11sx\n" "show all metadata" "$(rate "$show_o")" "$(rate "$show_e")" "$(rate "$show_x")" "$(ratio "$show_o" "$show_e")" "$(ratio "$show_o" "$show_x")"
printf "%-34s %12s %12s %12s %13sx %11sx\n" "set one property" "$(rate "$set_o")" "$(rate "$set_e")" "$(rate "$set_x")" "$(ratio "$set_o" "$set_e")" "$(ratio "$set_o" "$set_x")"
if [ -n "$set_f" ]; then
  printf "%-34s %12s %12s %12s %13sx %11sx\n" "set, the floor (bench/set_floor)" "$(rate "$set_f")" "" "" "$(ratio "$set_f" "$set_e")" "$(ratio "$set_f" "$set_x")"
fi
echo
echo "ovrameta wrote the label into $written of $count files; exiv2 read a title from $exiv2_read of $count files."
if [ -n "$set_f" ]; then
  rm -rf "$work/copy" && cp -a "$work/corpus" "$work/copy"
  (cd "$work/copy" && "$FLOOR" "$cores" "${files[@]}" >/dev/null 2>&1) || true
  floor_written=$(cd "$work/copy" && exiftool -fast -s3 -XMP-xmp:Label "${files[@]}" 2>/dev/null | grep -c '^Reviewed$' || true)
  echo "The floor wrote the label into $floor_written of $count files (in place, no sync, no aggregate, no checks)."
fi
echo "Targets: read at least 20x ExifTool and 1.5x exiv2; set at least 3x ExifTool."
