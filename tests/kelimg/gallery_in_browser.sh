#!/usr/bin/env bash
# Opens the gallery that `kelimg demo` writes in headless chromium, at a phone's width and a
# desktop's, and checks that every picture loads and stays inside its card and the page.
# Usage: gallery_in_browser.sh KELIMG. Exits 77, which ctest counts as skipped, without chromium.
set -euo pipefail
browser=$(command -v chromium || command -v chromium-browser || true)
if [[ -z $browser ]]; then
  echo "skipped: no chromium to open the gallery in (Debian: apt-get install chromium)"
  exit 77
fi
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
"$1" demo "$work/gallery" >/dev/null

# A page holds the gallery in frames as wide as a phone and a desktop window (a window cannot be
# made narrower than 500 px), judges it once loaded and adds its verdict to the DOM that chromium
# prints.
cat >"$work/gallery/check.html" <<'PAGE'
<!DOCTYPE html>
<iframe src="index.html" width="390" height="900" scrolling="no"></iframe>
<iframe src="index.html" width="1280" height="900" scrolling="no"></iframe>
<script>
addEventListener("load", () => {
  const verdicts = [];
  for (const frame of document.querySelectorAll("iframe")) {
    const page = frame.contentWindow, problems = [];
    for (const img of page.document.images) {
      const card = img.closest("figure").getBoundingClientRect(), box = img.getBoundingClientRect();
      if (!img.complete || img.naturalWidth === 0) problems.push(img.alt + " did not load");
      if (box.left < card.left - 0.5 || box.right > card.right + 0.5 ||
          box.bottom > card.bottom + 0.5)
        problems.push(img.alt + " overflows its card");
      if (card.right > page.innerWidth + 0.5) problems.push(img.alt + "'s card leaves the page");
    }
    verdicts.push(`width ${page.innerWidth}, ${page.document.images.length} pictures: ` +
                  (problems.join("; ") || "ok"));
  }
  const verdict = document.createElement("pre");
  verdict.id = "verdict";
  verdict.textContent = verdicts.join("\n");
  document.body.append(verdict);
});
</script>
PAGE

verdict=$("$browser" --headless --no-sandbox --disable-gpu --disable-quic --no-first-run \
  --disable-background-networking --disable-component-update --disable-sync \
  --allow-file-access-from-files --user-data-dir="$work/profile" --window-size=1400,1000 \
  --virtual-time-budget=10000 --dump-dom "file://$work/gallery/check.html" 2>/dev/null |
  sed -n '/<pre id="verdict">/,/<\/pre>/p' | sed 's|<[^>]*>||g')
echo "${verdict:-the page gave no verdict}"
[[ $verdict == "width 390, "[0-9][0-9]" pictures: ok"$'\n'"width 1280, "[0-9][0-9]" pictures: ok" ]]
