# The files of the project: git knows them; without git, everything but what was built.
# shellcheck shell=bash

project_files() {
    local top
    if top=$(git rev-parse --show-toplevel 2>/dev/null) && [[ $top == "$ROOT" ]]; then
        # New files count before they are committed; deleted ones no longer do.
        git ls-files --cached --others --exclude-standard | sort -u | while IFS= read -r file; do
            [[ ! -f $file ]] || printf '%s\n' "$file"
        done
    else
        find . \( -path ./build -o -path ./.git -o -path ./ci-output -o -name __pycache__ -o -name node_modules \
            -o -path ./console/dist \) -prune -o -type f -print |
            sed 's|^\./||' | sort
    fi
}

cpp_files() {
    project_files | grep -E '\.(cpp|cc|h|hpp)$'
}

shell_scripts() {
    local file
    project_files | while IFS= read -r file; do
        if [[ $file == *.sh || $file == *.bash ]] || head -n 1 -- "$file" 2>/dev/null |
            LC_ALL=C grep -aqE '^#!.*[/ ](ba|da)?sh( |$)'; then
            printf '%s\n' "$file"
        fi
    done
}
