# SPDX-License-Identifier: Apache-2.0
# shellcheck shell=bash disable=SC2154
# Shell code that ./start, ./test and .ci/run share: installing packages, configuring, building.
#
# The caller sets `root` to the project's folder and `set -euo pipefail`. What is said here goes to
# standard error, so that a program's standard output stays its own.

# step TEXT...: says what is being done.
step() {
    printf '== %s\n' "$*" >&2
}

# quietly LOG COMMAND...: runs the command with its output in the file LOG of the build folder, and
# prints that file only when the command fails, which ends the script. The command finds the script's
# standard error as descriptor 3.
quietly() {
    local log="$root/build/$1.log"
    shift
    mkdir -p "$root/build"
    if ! "$@" 3>&2 >"$log" 2>&1; then
        cat "$log" >&2
        step "failed: $*"
        exit 1
    fi
}

# showing_progress COMMAND...: runs the command and copies its output, in which lines begin with how many
# steps of how many are done, "[12/345] ". Tells how far it is on the terminal of standard error, or where
# that is none at each tenth of the way. For use below quietly, which keeps standard error for a log.
showing_progress() {
    "$@" 2>&1 | {
        local line percent told=0
        while IFS= read -r line; do
            printf '%s\n' "$line"
            if [[ $line =~ ^\[([0-9]+)/([0-9]+)\] ]]; then
                percent=$((100 * BASH_REMATCH[1] / BASH_REMATCH[2]))
                if [[ -t 3 ]]; then
                    printf '\r== %s of %s steps' "${BASH_REMATCH[1]}" "${BASH_REMATCH[2]}" >&3
                    ((percent < 100)) || printf '\n' >&3
                elif ((percent >= told + 10)); then
                    told=$((percent - percent % 10))
                    printf '== %s %% are built\n' "$told" >&3
                fi
            fi
        done
    }
}

# as_root COMMAND...: runs the command as root.
as_root() {
    if ((EUID == 0)); then
        "$@"
    else
        sudo "$@"
    fi
}

# install_packages FILE: installs those of the Debian packages named in FILE that are missing.
install_packages() {
    if ! command -v dpkg-query >/dev/null; then
        step "this is no Debian system; what the build needs is named in $1"
        return
    fi
    local wanted installed missing
    wanted=$(sed 's/#.*//' "$1" | xargs -n 1 | sort -u)
    # shellcheck disable=SC2086 # one word for each package
    installed=$(dpkg-query -W -f '${db:Status-Status} ${Package}\n' $wanted 2>/dev/null |
        sed -n 's/^installed //p' | sort -u || true)
    missing=$(comm -23 <(printf '%s\n' "$wanted") <(printf '%s\n' "$installed") | xargs)
    if [[ -z $missing ]]; then
        return
    fi
    step "installing $missing"
    quietly apt-update as_root apt-get update
    # shellcheck disable=SC2086
    quietly apt-install as_root env DEBIAN_FRONTEND=noninteractive \
        apt-get install -y --no-install-recommends $missing
}

# install_commands FILE: installs the Debian packages of those of the commands named in FILE that are
# missing, wherever else they might have come from.
install_commands() {
    local command package missing
    missing=$(sed 's/#.*//' "$1" | while read -r command package; do
        [[ -z $command ]] || command -v "$command" >/dev/null || printf '%s\n' "$package"
    done)
    if [[ -n $missing ]]; then
        install_packages <(printf '%s\n' "$missing")
    fi
}

# install_node_packages FOLDER: installs what FOLDER's package-lock.json names, unless it has been.
install_node_packages() {
    local installed="$1/node_modules/.package-lock.json"
    if [[ ! $installed -nt $1/package-lock.json ]]; then
        step "installing the npm packages of ${1#"$root/"}"
        (cd "$1" && quietly npm npm ci)
    fi
}

# build_client: builds the client library of the web page, unless it has been.
build_client() {
    local client="$root/web/client"
    if [[ -z $(find "$client/dist/index.js" -newer "$client/package-lock.json" 2>/dev/null) ]] ||
        [[ -n $(find "$client/src" -newer "$client/dist/index.js") ]]; then
        step "building ${client#"$root/"}"
        (cd "$client" && quietly npm npm run build)
    fi
}

# install_all: installs all that building, running and testing the project needs.
install_all() {
    install_packages "$root/packaging/debian-packages.txt"
    install_commands "$root/packaging/debian-commands.txt"
    install_node_packages "$root/web"
    install_node_packages "$root/web/client"
    build_client
}

# build NAME [CMAKE-ARGUMENT...] [-- TARGET...]: builds the targets, or all, in build/NAME, which is
# configured by the preset NAME unless arguments are given. Says nothing when there is nothing to do.
build() {
    local name=$1 folder="$root/build/$1"
    shift
    local -a configure=() targets=()
    while (($# > 0)) && [[ $1 != -- ]]; do
        configure+=("$1")
        shift
    done
    targets=("${@:2}")
    ((${#configure[@]} > 0)) || configure=(--preset "$name")

    # One at a time: two scripts in one build folder would spoil each other's work.
    mkdir -p "$folder"
    exec 9>"$root/build/$name.lock"
    if ! flock -n 9; then
        step "waiting for another build of $name to end"
        flock 9
    fi
    if [[ ! -f $folder/build.ninja ]]; then
        step "configuring $name"
        # cmake takes presets from the folder it is started in.
        (cd "$root" && quietly "$name-configure" cmake -G Ninja -S . -B "$folder" "${configure[@]}")
    fi
    if [[ $(ninja -C "$folder" -n "${targets[@]}" 2>&1) != *"no work to do"* ]]; then
        step "building $name"
        NINJA_STATUS='[%f/%t] ' quietly "$name-build" showing_progress \
            cmake --build "$folder" ${targets[@]+--target "${targets[@]}"}
    fi
    exec 9>&-
}

# run_tests NAME [CTEST-ARGUMENT...]: runs the tests of build/NAME in parallel, twice as many as there are
# processors, since many wait most of their time. Prints what is said of tests that do not pass, and the summary.
run_tests() {
    local name=$1
    shift
    step "running the tests of $name"
    ctest --test-dir "$root/build/$name" --parallel "$(($(nproc) * 2))" --output-on-failure \
        --no-tests=error "$@" |
        grep --line-buffered -vE '^ +Start +[0-9]+: |^ *[0-9]+/[0-9]+ Test +#[0-9]+: .* Passed '
}

# run_fuzz_targets SECONDS [TARGET...]: runs the fuzz targets of build/fuzz, or those named, for that
# long each, as many at a time as there are processors. They start from the inputs in fuzz/corpus; what
# they find new is kept in build/fuzz/corpus, for the next time. Prints the log of those that fail.
run_fuzz_targets() {
    local seconds=$1
    local -a targets=("${@:2}")
    if ((${#targets[@]} == 0)); then
        mapfile -t targets < <(cd "$root/build/fuzz/bin" && printf '%s\n' *_fuzz | sed 's/_fuzz$//')
    fi
    step "fuzzing for $seconds s each: ${targets[*]}"
    export root
    export -f run_fuzz_target step
    printf '%s\n' "${targets[@]}" |
        xargs -P "$(nproc)" -I{} bash -c 'run_fuzz_target "$1" "$2"' fuzz {} "$seconds"
}

# run_fuzz_target NAME SECONDS
run_fuzz_target() {
    local name=$1 seconds=$2 folder="$root/build/fuzz"
    local found="$folder/corpus/$name" log="$folder/$name.log"
    local -a options=(-max_total_time="$seconds" -timeout=60 -rss_limit_mb=4096
        -artifact_prefix="$folder/$name-")
    [[ ! -f $root/fuzz/$name.dict ]] || options+=(-dict="$root/fuzz/$name.dict")
    mkdir -p "$found"
    if "$folder/bin/${name}_fuzz" "${options[@]}" "$found" "$root/fuzz/corpus/$name" \
        >"$log" 2>&1; then
        step "$name: $(grep -a '^Done ' "$log")"
    else
        tail -n 100 "$log" >&2
        step "$name failed; its input is in build/fuzz"
        return 1
    fi
}
