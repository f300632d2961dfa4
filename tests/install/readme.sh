# shellcheck shell=bash
# Prints the first block of the file $2 that is fenced as language $1.
readme_block() {
    awk -v fence="\`\`\`$1" '
        inside && $0 == "```" { exit }
        inside { print }
        $0 == fence { inside = 1 }' "$2"
}
