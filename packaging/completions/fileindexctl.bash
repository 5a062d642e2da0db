# SPDX-License-Identifier: GPL-2.0-or-later
# Completion of fileindexctl for bash: commands, options, their values, names of shares.

# The options of a command. What ends in '=' takes its value there.
_fileindexctl_options() {
  case $1 in
    '' | share | folder | worker) echo '--help' ;;
    'share list' | 'folder list') echo '--help --json' ;;
    'share set') echo '--help --language' ;;
    'folder add') echo '--help --document --audio --video --photo --all --exclude' ;;
    'folder set') echo '--help --document= --audio= --video= --photo= --exclude --no-excludes' ;;
    event) echo '--help --path-old --data' ;;
    pause) echo '--help --until --for' ;;
    status) echo '--help --follow --json' ;;
    search) echo '--help --share --kind --under --sort --reverse --limit --offset --count --wait' \
      '--timeout --json -0' ;;
    info) echo '--help --terms --query --json' ;;
    stats) echo '--help --share --by --largest --duplicates --growth --json' ;;
    failed) echo '--help --retry --json' ;;
    dump) echo '--help --json -0' ;;
    verify) echo '--help --repair --json' ;;
    *) echo '--help' ;;
  esac
}

# What may stand at the place of a command's positional argument of that number: words, or one of
# "@share", "@file", "@folder".
_fileindexctl_positional() {
  case "$1:$2" in
    :1) echo 'share folder reindex event pause resume log-level worker status search info stats' \
      'failed dump verify' ;;
    share:1) echo 'add remove accept set list' ;;
    folder:1) echo 'add set remove list' ;;
    worker:1) echo 'drop revive' ;;
    'share add:2' | 'folder add:1' | 'folder set:1' | 'folder remove:1') echo '@folder' ;;
    'share remove:1' | 'share accept:1' | 'share set:1') echo '@share' ;;
    'worker drop:1' | 'worker revive:1') echo '@share' ;;
    event:1 | failed:1 | dump:1 | verify:1) echo '@share' ;;
    reindex:1 | info:1 | event:3) echo '@file' ;;
    log-level:1) echo 'debug error' ;;
  esac
}

# What an option takes, in the same words; "-" for any text. Nothing: it takes none.
_fileindexctl_value() {
  case "$1:$2" in
    *:--share) echo '@share' ;;
    *:--kind) echo 'document audio video photo other folder' ;;
    *:--sort) echo 'name size modified' ;;
    *:--by) echo 'kind ext owner folder age' ;;
    *:--under | *:--path-old) echo '@file' ;;
    'folder set:--document' | 'folder set:--audio' | 'folder set:--video' | 'folder set:--photo')
      echo 'on off' ;;
    'share set:--language')
      echo 'arabic armenian basque catalan danish dutch english finnish french german greek' \
        'hindi hungarian indonesian irish italian lithuanian nepali none norwegian porter' \
        'portuguese romanian russian serbian spanish swedish tamil turkish yiddish' ;;
    *:--exclude | *:--data | *:--until | *:--for | *:--limit | *:--offset | \
      *:--timeout | *:--query | *:--largest | *:--growth) echo '-' ;;
  esac
}

# Lines of `$1 share list`, which has none where there is no state.
_fileindexctl_shares() {
  [[ -e ${FILEINDEXD_STATE_DIR:-/var/lib/fileindexd}/state.db ]] && "$1" share list 2>/dev/null
}

# Fills `plain` with the word `$1` as it is without quotes and backslashes.
_fileindexctl_unquote() {
  local rest=${1#\"}
  plain=''
  if [[ $rest == \'* ]]; then
    plain=${rest#\'}
    return
  fi
  while [[ $rest == *\\* ]]; do
    plain+=${rest%%\\*}
    rest=${rest#*\\}
    plain+=${rest:0:1}
    rest=${rest:1}
  done
  plain+=$rest
}

# Paths that begin with the word `$2`, each ended with NUL, as lines may end within them. `$1`:
# "@folder" for folders alone.
_fileindexctl_paths() (
  _fileindexctl_unquote "$2"
  user=''
  home=''
  if [[ $2 =~ ^~[A-Za-z0-9._-]*/ ]]; then
    user=${BASH_REMATCH[0]}
    eval "home=$user"  # of a user that there is not, it stays
    plain=$home${plain#"$user"}
  fi
  GLOBIGNORE=''
  set +f
  shopt -u failglob
  shopt -s nullglob dotglob
  for path in "$plain"*; do
    [[ $1 == @folder && ! -d $path ]] && continue
    [[ -n $user ]] && path=$user${path#"$home"}
    printf '%s\0' "$path"
  done
)

# Fills COMPREPLY with what of `$1` (see above) begins with `$2`. `$3`: the program.
_fileindexctl_reply() {
  local name plain
  case $1 in
    '' | -) ;;
    @share)
      _fileindexctl_unquote "$2"
      while IFS=$'\t' read -r name _; do
        [[ $name == "$plain"* ]] || continue
        [[ $2 == [\"\']* ]] || printf -v name '%q' "$name"
        COMPREPLY+=("$name")
      done < <(_fileindexctl_shares "$3")
      ;;
    @file | @folder)
      # Outside of a completion there is nothing to set.
      compopt -o filenames 2>/dev/null
      mapfile -d '' -t COMPREPLY < <(_fileindexctl_paths "$1" "$2")
      ;;
    *) mapfile -t COMPREPLY < <(compgen -W "$1" -- "$2") ;;
  esac
}

# Fills `words` with the words of the line, up to the one being completed. The shell parts them at
# ':' and '=' too; what no blank stands between is one.
_fileindexctl_words() {
  local rest=$COMP_LINE at blanks
  for ((at = 0; at <= COMP_CWORD; ++at)); do
    blanks=${rest%%[![:blank:]]*}
    rest=${rest#"$blanks"}
    if [[ -n $blanks || at -eq 0 ]]; then
      words+=("${COMP_WORDS[at]}")
    else
      words[-1]+=${COMP_WORDS[at]}
    fi
    rest=${rest#"${COMP_WORDS[at]}"}
  done
}

_fileindexctl() {
  local words=() current previous='' command='' value count=0 word are_options_over=''
  COMPREPLY=()
  _fileindexctl_words
  current=${words[-1]}
  # Which command it is, and how many arguments it has so far.
  for word in "${words[@]:1:${#words[@]}-2}"; do
    if [[ -n $previous && -n $(_fileindexctl_value "$command" "$previous") ]]; then
      previous=''
      continue
    fi
    previous=''
    if [[ -z $are_options_over && $word == -* ]]; then
      previous=$word
      [[ $word == -- ]] && are_options_over=yes
      continue
    fi
    case $command in
      '') command=$word ;;
      share | folder | worker) command+=" $word" ;;
      *) ((++count)) ;;
    esac
  done

  if [[ -z $are_options_over && $current == --*=* ]]; then
    previous=${current%%=*}
    current=${current#*=}
  fi
  value=$(_fileindexctl_value "$command" "$previous")
  if [[ -n $value ]]; then
    _fileindexctl_reply "$value" "$current" "${1:-fileindexctl}"
  elif [[ -z $are_options_over && $current == -* ]]; then
    _fileindexctl_reply "$(_fileindexctl_options "$command")" "$current"
    [[ ${#COMPREPLY[@]} -eq 1 && ${COMPREPLY[0]} == *= ]] && compopt -o nospace 2>/dev/null
  else
    _fileindexctl_reply "$(_fileindexctl_positional "$command" $((count + 1)))" "$current" \
      "${1:-fileindexctl}"
  fi

  # The shell replaces what stands behind the last ':' or '=' alone.
  local last=${COMP_WORDS[COMP_CWORD]}
  [[ $last == *[!:=]* ]] || last=''
  local kept=${current%"$last"}
  COMPREPLY=("${COMPREPLY[@]#"$kept"}")
  return 0
}

complete -F _fileindexctl fileindexctl
