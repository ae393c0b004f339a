#!/usr/bin/env bash
# Makes a deployment's own data: a fresh table of 48 built-in RSA moduli and two fresh master
# PIN keys for the build, and their private halves for the bank's servers.
#
# Usage: tools/keys/make_deployment.sh -c CONFIG_DIR -s SECRETS_DIR
#   -c  build configuration (outside the source tree, or in a git-ignored build directory):
#         moduli.inc        the modulus table            (TESSEL_MODULI_FILE)
#         master_keys.inc   the master-key fragments     (TESSEL_MASTER_KEYS_FILE)
#         deployment.cmake  sets both; configure with   cmake -C CONFIG_DIR/deployment.cmake ...
#   -s  private halves, for the servers only (must lie outside the source tree; mode 700):
#         app_platform.pem  private key of the default modulus (slot 12): tessel_open --key
#         private_keys/     the private key of every slot (kFirstNN.pem, kSecondNN.pem)
#         master_keys.txt   the primary and alternate master PIN keys, 32 hex digits each
# Neither directory may already hold these files: existing keys are never overwritten.
set -euo pipefail
umask 077

usage() { sed -n '5,15p' "$0" >&2; exit 2; }
config="" secrets=""
while getopts "c:s:" opt; do
  case "$opt" in
    c) config=$OPTARG ;;
    s) secrets=$OPTARG ;;
    *) usage ;;
  esac
done
[ -n "$config" ] && [ -n "$secrets" ] || usage
command -v openssl >/dev/null || { echo "make_deployment: openssl is needed" >&2; exit 1; }

repo=$(cd "$(dirname "$0")/../.." && pwd -P)
config=$(realpath -m "$config")
secrets=$(realpath -m "$secrets")
inside_repo() { case "$1/" in "$repo"/*) return 0 ;; *) return 1 ;; esac; }
if inside_repo "$secrets"; then
  echo "make_deployment: $secrets is inside the source tree; private keys go elsewhere" >&2
  exit 1
fi
if inside_repo "$config" && ! git -C "$repo" check-ignore -q "$config/moduli.inc" 2>/dev/null; then
  echo "make_deployment: $config is inside the source tree and not ignored by git" >&2
  exit 1
fi
for f in "$config/moduli.inc" "$config/master_keys.inc" "$config/deployment.cmake" \
         "$secrets/app_platform.pem" "$secrets/private_keys" "$secrets/master_keys.txt"; do
  if [ -e "$f" ]; then echo "make_deployment: $f exists; refusing to overwrite keys" >&2; exit 1; fi
done
mkdir -p "$config" "$secrets"
chmod 700 "$secrets"

bash "$repo/tools/keys/generate_moduli.sh" -P -o "$config/moduli.inc" \
     -p "$secrets/app_platform.pem" -k "$secrets/private_keys" >/dev/null

primary=$(openssl rand -hex 16 | tr a-f A-F)
alternate=$(openssl rand -hex 16 | tr a-f A-F)
cut1=$((8 + $(od -An -N1 -tu1 /dev/urandom) % 9))   # fragments of 8..16, 8..14 and the rest
cut2=$((8 + $(od -An -N1 -tu1 /dev/urandom) % 7))
{
  echo "// Master PIN keys of the key-hierarchy PIN type, made by tools/keys/make_deployment.sh"
  echo "// on $(date -u +%Y-%m-%d). Production data: keep it out of the source tree."
  echo "#define TESSEL_MASTER_KEY_PRIMARY_1 \"${primary:0:cut1}\""
  echo "#define TESSEL_MASTER_KEY_PRIMARY_2 \"${primary:cut1:cut2}\""
  echo "#define TESSEL_MASTER_KEY_PRIMARY_3 \"${primary:cut1+cut2}\""
  echo "#define TESSEL_MASTER_KEY_ALTERNATE \"$alternate\""
} > "$config/master_keys.inc"
printf 'primary %s\nalternate %s\n' "$primary" "$alternate" > "$secrets/master_keys.txt"
{
  echo "# Deployment data made by tools/keys/make_deployment.sh: cmake -C $config/deployment.cmake"
  echo "set(TESSEL_MODULI_FILE \"$config/moduli.inc\" CACHE FILEPATH \"Built-in RSA moduli\")"
  echo "set(TESSEL_MASTER_KEYS_FILE \"$config/master_keys.inc\" CACHE FILEPATH \"Master PIN keys\")"
} > "$config/deployment.cmake"

echo "build configuration: $config (configure with -C $config/deployment.cmake)"
echo "private halves:      $secrets (servers only; never commit, never ship in the app)"
