# shellcheck shell=bash
# What the scripts share. To be sourced.

CHECKOUT=$(dirname -- "$(dirname -- "$(readlink -f -- "${BASH_SOURCE[0]}")")")

# Configures and builds a preset, or only the targets named behind it; what that prints is only shown when it
# fails.
build_preset() {
    local preset=$1 log
    shift
    echo "Building $preset"
    log=$(mktemp)
    if ! (cd -- "$CHECKOUT" && cmake --preset "$preset" &&
        cmake --build --preset "$preset" --target "${@:-all}") >"$log" 2>&1; then
        cat -- "$log" >&2
        rm -f -- "$log"
        return 1
    fi
    rm -f -- "$log"
}

# A machine that is made for one run and thrown away after it.
is_disposable_container() {
    [[ -e /.dockerenv || -e /run/.containerenv || -n ${KUBERNETES_SERVICE_HOST:-} ]]
}

# Runs a command in a throwaway appliance with the programs of a build folder. Where the kernel refuses one, a
# disposable container is taken for it.
in_appliance() {
    local build=$1
    shift
    if "$CHECKOUT/device/boot" --check 2>/dev/null; then
        "$CHECKOUT/device/boot" --build "$build" -- "$@"
    elif [[ $EUID == 0 ]] && is_disposable_container; then
        echo "The kernel refuses namespaces: this container itself is the appliance." >&2
        "$CHECKOUT/device/boot" --here --build "$build" -- "$@"
    else
        "$CHECKOUT/device/boot" --build "$build" -- "$@" # says what is missing
    fi
}
