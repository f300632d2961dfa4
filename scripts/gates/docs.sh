# shellcheck shell=bash
# The reference is made without a warning, so every public name is described; the manual pages are well
# formed, and each name in them can be looked up.
docs() {
    local pages unnamed
    scripts/docs
    pages=(docs/man/man[37]/*)
    mandoc -Tlint -W warning "${pages[@]}"
    unnamed=$(for page in "${pages[@]}"; do
        lexgrog "$page" >/dev/null || echo "$page"
        man -l "$page" >/dev/null || echo "$page"
    done)
    [ -z "$unnamed" ] || {
        printf '%s: is no page for man\n' "$unnamed"
        return 1
    }
    scripts/man --check
    printf '\ndocs: %d pages of reference, %d manual pages, 0 warnings\n' \
        "$(find build/docs/html -name '*.html' | wc -l)" "${#pages[@]}"
}
