#!/usr/bin/env bash
# Small pictures of photographs of camera size, beside vipsthumbnail itself in the same run.
#   thumbnail_bench.sh BUILD [COUNT]
# 1,000 without it: 20 pictures of 12 to 24 megapixels, the demo's with noise over them, as JPEG with EXIF, one in
# twenty as HEIC, one as AVIF (6 megapixels: their encoders take long); further ones are copies with other bytes behind their end.
# As many at once as there are processors, as they come from a page.
set -uo pipefail
source=$(realpath "$(dirname "$0")/..")
build=$(realpath "$1")
count=${2:-1000}
for program in vips vipsthumbnail xargs; do
    command -v "$program" >/dev/null || { echo "FAILED: $program is not installed"; exit 1; }
done
server=$source/script/server
set -- "$server" "$build"
. "$source/tests/apps/served.sh"
photo=$(root_of photo)
folder=$photo/cameras
mkdir "$folder" "$work/made" "$work/small"

# The noise decides how many bytes it takes.
make() { # number, width, height, file
    local from
    from=$(find "$photo/Landscapes" -name '*.png' | sort | sed -n "$((1 + $1 % 12))p")
    vips thumbnail "$from" "$work/a.v" "$2" --height "$3" --size force &&
        vips gaussnoise "$work/n.v" "$2" "$3" --sigma 14 --mean 0 --seed "$1" && vips add "$work/a.v" "$work/n.v" "$work/s.v" &&
        vips cast "$work/s.v" "$work/c.v" uchar && vips copy "$work/c.v" "$4" --interpretation srgb
}
sizes=("4000 3000" "4608 3456" "4928 3264" "6000 4000")
distinct=20
echo "making $distinct pictures"
for ((i = 0; i < distinct; ++i)); do
    read -r width height <<<"${sizes[i % 4]}"
    case $i in 8 | 12) width=3000 height=2000 ;; esac
    case $i in 8) ending='heic[Q=60,effort=0]' ;; 12) ending='avif[Q=60,effort=0]' ;; *) ending='jpg[Q=82]' ;; esac
    make "$i" "$width" "$height" "$work/made/$i.$ending" || exit 1
done
for ((i = 0; i < count; ++i)); do
    for file in "$work/made/$((i % distinct))".*; do
        name=$(printf '%s/photo %04d.%s' "$folder" "$i" "${file##*.}")
        cp "$file" "$name"
        printf '%08d' "$i" >>"$name"
    done
done
chmod -R a+rX "$folder"
find "$folder" -type f -printf '%s\n' | awk -v n="$distinct" '{ s += $1 } END { printf "%d files of %.1f MB on average, %d distinct\n", NR, s / NR / 1e6, n }'

ask() { # from, to
    local i
    for ((i = $1; i < $2; ++i)); do
        printf 'url = "http://127.0.0.1:%s/cgi-bin/thumbnail?path=%s&size=256"\noutput = /dev/null\n' "$port" \
            "$(basename "$(printf '%s\n' "$folder/photo $(printf %04d "$i")".*)" | sed 's| |%20|; s|^|/photo/cameras/|')"
    done | curl -s -K - -u "alice:$(password alice)" --parallel --parallel-max "$(nproc)" --retry 20 --write-out '%{http_code}\n' 2>/dev/null | sort | uniq -c
}
drawn() { # from, to
    (cd "$folder" && find . -name 'photo*' | sort | sed -n "$(($1 + 1)),$2p" | tr '\n' '\0') | (cd "$folder" && VIPS_CONCURRENCY=1 xargs -0 -n 1 -P "$(nproc)" \
        sh -c 'vipsthumbnail "$2" --size "256x256>" --eprofile=srgb -o "$1/%s.webp[Q=75,strip]"' - "$work/small" 2>/dev/null)
    printf '%7d drawn\n' "$(find "$work/small" -type f | wc -l)"
}
# Seconds of the processors, of those that ended.
children() { awk '{ print ($16 + $17) / 100 }' "/proc/$1/stat"; }
orveld=$(pgrep -P "$(pgrep -P "$pid" -f orveld-keeper)" | head -1)
timed() { # what, whose children, command...
    local what=$1 whose=$2 begin after cpu
    shift 2
    (while sleep 0.1; do ps -C vipsthumbnail -o rss=; done) >"$work/memory" &
    local watch=$!
    begin=$EPOCHREALTIME cpu=$(children "$whose")
    "$@"
    after=$EPOCHREALTIME
    kill "$watch"
    awk -v m="$(sort -n "$work/memory" | tail -1)" -v w="$what" -v t="$(echo "$after $begin" | awk '{ print $1 - $2 }')" -v c="$(children "$whose")" -v b="$cpu" \
        'BEGIN { printf "%-34s %7.2f s  %7.2f s of processors, a decoder %d MiB\n", w, t, c - b, m / 1024 }'
}
first=$((count < 30 ? count : 30))
timed "first screen ($first)" "$orveld" ask 0 "$first"
timed "vipsthumbnail, the same" $$ drawn 0 "$first"
timed "the others" "$orveld" ask "$first" "$count"
timed "vipsthumbnail, the same" $$ drawn "$first" "$count"
timed "all, from the cache" "$orveld" ask 0 "$count"
du -sh "$demo/var/cache/orvel/thumbnails" | cut -f1 | sed 's/^/cache: /'
finish
