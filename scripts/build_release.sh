# For scripts/extract and scripts/zarvo to source, once they have set root to the root of the source.
source "$root/scripts/run_quietly.sh"

# build_release TARGET builds the target with the preset "release". The script ends when that fails.
build_release() {
    local folder="$root/build/release"
    if ! mkdir -p "$folder" 2>/dev/null || [[ ! -w "$folder" ]]; then
        echo "$0: can't build in $folder, which must be a folder that $(id -un) may write to; copy the source to one of your own" >&2
        exit 1
    fi
    run_quietly configure_and_build "$1" || exit 1
}

# A build folder that was configured elsewhere, or by another version of CMake, must be configured afresh.
configure_and_build() (
    cd "$root"
    { cmake --preset release || cmake --fresh --preset release; } && cmake --build --preset release --target "$1"
)
