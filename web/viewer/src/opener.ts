// How a file is chosen: from the list of the server, by its URL, or from the user's own disk.
import { h } from "./dom.js";
import { offered, originOfListed } from "./gallery.js";
import { type Origin, originOf } from "./raster.js";

/** A pyramid among files that were chosen or dropped together, with the sidecar that belongs to it. */
export function chosen(files: readonly File[]): Origin | undefined {
  const file = files.find(({ name }) => !name.endsWith(".aux.xml")) ?? files[0];
  const sidecar = files.find(({ name }) => name === `${file?.name}.aux.xml`);
  return file && { name: file.name, file, ...(sidecar && { sidecar }) };
}

/**
 * A form with all ways to open a file: with the list of the server, unless that stands elsewhere. `open` is called with
 * the one that is chosen.
 */
export function opener(open: (origin: Origin) => void, lists = true): HTMLElement {
  const picker = h("input", {
    type: "file",
    multiple: true,
    class: "hidden",
    tabindex: -1,
    "aria-label": "A pyramid file",
    onchange: () => {
      const origin = chosen([...(picker.files ?? [])]);
      picker.value = "";
      if (origin) open(origin);
    },
  });
  const address = h("input", {
    type: "text",
    inputmode: "url",
    placeholder: "https://…/scene.pyr",
    "aria-label": "Address of a file",
    spellcheck: "false",
  });
  const form = h(
    "form",
    {
      class: "address",
      onsubmit: (event: SubmitEvent) => {
        event.preventDefault();
        const url = address.value.trim();
        if (URL.canParse(url, document.baseURI)) open(originOf(url));
        else address.setCustomValidity("This is no address.");
        form.reportValidity();
      },
    },
    address,
    h("button", { type: "submit" }, "Open"),
  );
  address.addEventListener("input", () => address.setCustomValidity(""));
  const list = h("ul", { class: "files", "aria-label": "Files of this server", hidden: true });
  if (lists)
    void offered().then((listing) => {
      list.hidden = !listing;
      for (const file of listing?.files ?? [])
        list.append(h("li", {}, h("button", { type: "button", onclick: () => open(originOfListed(file)) }, file.name)));
    });
  return h(
    "div",
    { class: "opener" },
    list,
    h("button", { type: "button", class: "primary", onclick: () => picker.click() }, "Choose a file…"),
    picker,
    h("p", { class: "note" }, "or drop one anywhere on this page"),
    form,
  );
}
