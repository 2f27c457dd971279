"use strict";
(() => {
  const data = JSON.parse(document.getElementById("data").textContent);
  const byId = (id) => document.getElementById(id);

  // Texts come from devices: they become text nodes and attribute values, never markup.
  function element(name, attributes, ...children) {
    const made = document.createElement(name);
    for (const [key, value] of Object.entries(attributes ?? {})) {
      if (value !== undefined && value !== false) made.setAttribute(key, value === true ? "" : value);
    }
    made.append(...children.filter((child) => child !== null && child !== undefined && child !== ""));
    return made;
  }
  function icon(name, className) {
    const svg = document.createElementNS("http://www.w3.org/2000/svg", "svg");
    svg.setAttribute("class", className);
    svg.setAttribute("aria-hidden", "true");
    const use = document.createElementNS("http://www.w3.org/2000/svg", "use");
    use.setAttribute("href", `#i-${name}`);
    svg.append(use);
    return svg;
  }
  const tidied = (text) => text.replace(/[\u0000-\u001f\u007f-\u009f]/g, "\ufffd").replace(/ +/g, " ").trim();
  const firstOf = (...texts) => texts.map((text) => tidied(text ?? "")).find((text) => text !== "") ?? "";
  const plural = (count, word) => `${count} ${word}${count === 1 ? "" : "s"}`;
  const hex4 = (number) => number.toString(16).toUpperCase().padStart(4, "0");
  const idText = (node) => (node.VendorId < 0 || node.ProductId < 0 ? "" : `${hex4(node.VendorId)}:${hex4(node.ProductId)}`);
  const onPort = (node) => (node.portPath ?? "").includes("-");
  const serialText = (node) => (node.SerialNumber.includes("&") ? "" : tidied(node.SerialNumber));
  const nameOf = (device) =>
    firstOf(device.Product, device.Description, device.FriendlyName, device.disks?.[0]?.name) || "Unknown device";
  const vendorOf = (node) => firstOf(node.vendorName, node.Manufacturer1);

  function iconOf(device) {
    const what = `${device.Service ?? ""} ${device.DevClass ?? ""}`.toLowerCase();
    const kinds = [["storage", /usbstor|uaspstor|diskdrive|cdrom/], ["input", /hid|keyboard|mouse/], ["bluetooth", /bth|bluetooth/],
                   ["camera", /usbvideo|camera|image/], ["audio", /usbaudio|media/], ["printer", /print/], ["network", /net\b|ndis|wlan/],
                   ["composite", /usbccgp/]];
    return kinds.find(([, pattern]) => pattern.test(what))?.[0] ?? (device.disks?.length ? "storage" : "device");
  }
  function lettersOf(mountPoints) {
    const texts = mountPoints.map((path) => path.replace(/\\$/, ""));
    return texts.map((text) => element("span", { class: /^[A-Za-z]:$/.test(text) ? "letter" : "letter folder" }, text));
  }

  // ---- The items of the tree: controllers (with their root hub), hubs and devices.

  const items = [];
  const byNode = new Map();
  const devices = [];
  let hubs = 0;

  function addItem(kind, node, parent, facts) {
    const item = { kind, node, parent, children: [], ...facts };
    items.push(item);
    byNode.set(node, item);
    parent?.children.push(item);
    return item;
  }
  function addDevice(node, parent, port) {
    // What a stick says about itself is in the name of its disk.
    const about = [node.disks[0]?.name ?? vendorOf(node), idText(node), serialText(node) && `serial ${serialText(node)}`].filter(Boolean).join(" · ");
    const item = addItem("device", node, parent, { port, name: nameOf(node), about, letters: node.mountPoints });
    const disks = node.disks.flatMap((disk) => [disk.name, ...disk.volumes.map((volume) => volume.VolumeName)]);
    item.text = [item.name, about, vendorOf(node), node.Vendor, node.Product, node.Description, node.FriendlyName ?? "", ...disks].join("\n");
    item.exact = [node.portPath, idText(node), hex4(Math.max(node.VendorId, 0)), ...node.driveLetters,
                  ...node.mountPoints, ...node.mountPoints.map((path) => path.replace(/\\$/, ""))];
    devices.push(item);
  }
  function addPorts(hub, item) {
    item.ports = hub.Childs.map((port) => ({ number: port.PortIndex, full: port.Childs.length > 0 }));
    for (const port of hub.Childs) {
      for (const child of port.Childs) {
        if (child.Type === "KUDTHub") {
          ++hubs;
          const below = addItem("hub", child, item, { port: port.PortIndex, name: firstOf(child.Product, child.Description) || "Hub" });
          below.about = [vendorOf(child), idText(child)].filter(Boolean).join(" · ");
          below.text = [below.name, below.about, child.vendorName].join("\n");
          below.exact = [child.portPath, idText(child)];
          addPorts(child, below);
        } else if (child.Type === "KUDTPortDevice") {
          addDevice(child, item, port.PortIndex);
        }
      }
    }
  }
  function addStorage(node, item) {
    if (node.Type === "KUDTPortDevice") addDevice(node, item, 0);
    else for (const child of node.Childs) addStorage(child, item);
  }
  const hasDevice = (node) => node.Type === "KUDTPortDevice" || node.Childs.some(hasDevice);

  const controllers = [];
  for (const node of data.RootNode.Childs) {
    const isUsb = node.LeafName !== "";
    // A storage controller is worth a card only for devices below it.
    if (!isUsb && !hasDevice(node)) continue;
    const item = addItem("controller", node, null, { name: firstOf(node.Description, node.InstanceId) });
    item.about = `Controller ${node.controller}${isUsb ? "" : " · not USB"}`;
    item.text = `${item.name}\n${node.InstanceId}`;
    item.exact = [String(node.controller)];
    if (isUsb) {
      for (const hub of node.Childs) if (hub.Type === "KUDTHub") addPorts(hub, item);
    } else {
      addStorage(node, item);
    }
    controllers.push(item);
  }
  for (const item of items) {
    item.text = item.text.toLowerCase();
    item.exact = new Set(item.exact.filter(Boolean).map((text) => text.toLowerCase()));
  }

  // ---- The tree.

  // What only a screen reader needs.
  const spoken = (text) => element("span", { class: "spoken" }, text);
  function portsOf(item) {
    if (!item.ports) return [];
    const used = item.ports.filter((port) => port.full).length;
    const cells = item.ports.map(({ number, full }) =>
      element("i", { class: `cell${full ? " full" : ""}${number > 99 ? " wide" : ""}` }, String(number)));
    return [spoken(` ${plural(item.ports.length, "port")}, ${used} in use`),
            element("span", { class: "ports", "aria-hidden": "true" }, ...cells)];
  }
  function show(item, level, position, size) {
    const parts = [
      item.children.length ? icon("fold", "fold") : element("span", { class: "nofold" }),
      item.port ? element("span", { class: "number" }, spoken("Port "), String(item.port)) : null,
      icon(item.kind === "device" ? iconOf(item.node) : item.kind, "icon"),
      element("span", { class: "text" }, spoken(item.kind === "hub" ? " Hub " : " "), element("span", { class: "name" }, item.name),
        " ", element("span", { class: "about" }, item.about)),
      ...portsOf(item)];
    if (item.letters?.length) parts.push(spoken(" on "), element("span", { class: "letters" }, ...lettersOf(item.letters)));
    if (item.kind === "device" && onPort(item.node)) {
      parts.push(" ", element("span", { class: "speed" }, `${item.node.speed} speed`));
    }
    item.row = element("div", {
      class: "row", role: "treeitem", tabindex: "-1", "aria-level": level, "aria-posinset": position, "aria-setsize": size,
      "aria-selected": "false", "aria-expanded": item.children.length ? "true" : undefined,
    }, ...parts);
    item.row.item = item;
    item.li = element("li", { class: item.kind + (position === size ? " last" : ""), role: "none" }, item.row);
    if (item.children.length) {
      const below = item.children.map((child, at) => show(child, level + 1, at + 1, item.children.length));
      item.li.append(element("ul", { role: "group" }, ...below));
    }
    return item.li;
  }

  const tree = byId("tree");
  const start = performance.now();
  tree.append(...controllers.map((item, at) => show(item, 1, at + 1, controllers.length)));
  if (!controllers.length) {
    // A tree needs an item.
    tree.hidden = true;
    byId("none").hidden = false;
    byId("none").textContent = "No USB device was found on this PC.";
  }

  const isFolded = (item) => item.row.getAttribute("aria-expanded") === "false";
  const fold = (item, folded) => item.children.length && item.row.setAttribute("aria-expanded", String(!folded));
  const isShown = (item) => !item.li.hidden;
  let current = controllers[0] ?? null;
  let chosen = null;
  current?.row.setAttribute("tabindex", "0");

  function moveTo(item, focus = true) {
    if (!item) return;
    current?.row.setAttribute("tabindex", "-1");
    current = item;
    item.row.setAttribute("tabindex", "0");
    if (!focus) return;
    item.row.focus({ preventScroll: true });
    item.row.scrollIntoView({ block: "nearest" });
  }
  function choose(item) {
    chosen?.row.setAttribute("aria-selected", "false");
    chosen = item;
    item.row.setAttribute("aria-selected", "true");
    detail(item);
  }
  function reveal(item) {
    for (let above = item.parent; above; above = above.parent) fold(above, false);
    for (let above = item; above; above = above.parent) above.li.hidden = false;
    showView("topology");
    choose(item);
    moveTo(item);
    item.row.scrollIntoView({ block: "center" });
  }
  const shownChildren = (item) => (item ? item.children : controllers).filter(isShown);
  function next(item) {
    if (!isFolded(item) && shownChildren(item).length) return shownChildren(item)[0];
    for (let at = item; at; at = at.parent) {
      const siblings = shownChildren(at.parent);
      const after = siblings[siblings.indexOf(at) + 1];
      if (after) return after;
    }
    return null;
  }
  function deepest(item) {
    while (item && !isFolded(item) && shownChildren(item).length) item = shownChildren(item).at(-1);
    return item;
  }
  function previous(item) {
    const siblings = shownChildren(item.parent);
    const at = siblings.indexOf(item);
    return at > 0 ? deepest(siblings[at - 1]) : item.parent;
  }
  // The next item whose name begins so, round the end.
  function byFirstLetter(letter) {
    const starts = (item) => item.name.toLowerCase().startsWith(letter);
    for (let item = next(current); item; item = next(item)) if (starts(item)) return item;
    for (let item = shownChildren(null)[0]; item && item !== current; item = next(item)) if (starts(item)) return item;
    return null;
  }

  tree.addEventListener("click", (event) => {
    const item = event.target.closest("[role=treeitem]")?.item;
    if (!item) return;
    if (event.target.closest(".fold")) fold(item, !isFolded(item));
    choose(item);
    moveTo(item);
  });
  tree.addEventListener("dblclick", (event) => {
    const item = event.target.closest("[role=treeitem]")?.item;
    if (item && !event.target.closest(".fold")) fold(item, !isFolded(item));
  });
  tree.addEventListener("keydown", (event) => {
    if (!current || event.ctrlKey || event.metaKey || event.altKey) return;
    const hasChildren = current.children.length > 0;
    const keys = {
      ArrowDown: () => moveTo(next(current)),
      ArrowUp: () => moveTo(previous(current)),
      ArrowRight: () => (hasChildren && isFolded(current) ? fold(current, false) : moveTo(shownChildren(current)[0])),
      ArrowLeft: () => (hasChildren && !isFolded(current) ? fold(current, true) : moveTo(current.parent)),
      Home: () => moveTo(shownChildren(null)[0]),
      End: () => moveTo(deepest(shownChildren(null).at(-1))),
      Enter: () => choose(current),
      " ": () => choose(current),
      "*": () => shownChildren(current.parent).forEach((item) => fold(item, false)),
    };
    const act = keys[event.key] ?? (/^[\p{L}\p{N}]$/u.test(event.key) ? () => moveTo(byFirstLetter(event.key.toLowerCase())) : null);
    if (!act) return;
    event.preventDefault();
    act();
  });
  function foldAll(folded) {
    for (const item of items) fold(item, folded);
    if (folded && current) while (current.parent) moveTo(current.parent, false);
  }
  byId("fold").addEventListener("click", () => foldAll(true));
  byId("unfold").addEventListener("click", () => foldAll(false));

  // ---- Search.

  function matches(item, words) {
    return words.every((word) => item.exact.has(word) || (!/^[a-z]:\\?$/.test(word) && item.text.includes(word)));
  }
  function highlight(words) {
    if (!window.Highlight || !CSS.highlights) return;
    const ranges = [];
    for (const item of words.length ? items.filter(isShown) : []) {
      for (const place of item.row.querySelectorAll(".name, .about, .letter")) {
        const text = place.firstChild;
        for (const word of text ? words : []) {
          const at = text.data.toLowerCase().indexOf(word);
          // Where lowering changes the length, nothing is marked rather than the wrong part.
          if (at < 0 || text.data.toLowerCase().length !== text.data.length) continue;
          const range = new Range();
          range.setStart(text, at);
          range.setEnd(text, at + word.length);
          ranges.push(range);
        }
      }
    }
    CSS.highlights.set("hit", new Highlight(...ranges));
  }
  function search() {
    const words = byId("search").value.toLowerCase().split(/\s+/).filter(Boolean);
    const found = words.length ? items.filter((item) => matches(item, words)) : items;
    for (const item of items) item.li.hidden = words.length > 0;
    for (const item of words.length ? found : []) {
      for (let above = item; above && above.li.hidden; above = above.parent) {
        above.li.hidden = false;
        if (above !== item) fold(above, false);
      }
    }
    // The wire ends at the last one that is shown.
    for (const siblings of [controllers, ...items.map((item) => item.children)]) {
      const last = siblings.findLast(isShown);
      for (const item of siblings) item.li.classList.toggle("last", item === last);
    }
    byId("matches").textContent = words.length ? (found.length ? plural(found.length, "match").replace(/match(s)$/, "matches") : "No match") : "";
    if (controllers.length) {
      byId("none").hidden = found.length > 0;
      byId("none").textContent = "Nothing on this PC matches.";
    }
    if (current && !isShown(current)) moveTo(shownChildren(null)[0], false);
    highlight(words);
    return words.length ? found : [];
  }
  byId("search").addEventListener("input", () => { showView("topology"); search(); });
  byId("search").addEventListener("keydown", (event) => {
    if (event.key === "Enter") {
      const found = search();
      if (found.length) reveal(found.find((item) => item.kind === "device") ?? found[0]);
    } else if (event.key === "Escape") {
      byId("search").value = "";
      search();
    }
  });
  document.addEventListener("keydown", (event) => {
    if (event.key !== "/" || event.target instanceof HTMLInputElement) return;
    event.preventDefault();
    byId("search").focus();
  });

  // ---- Details.

  function list(pairs, className) {
    const made = element("dl", { class: className });
    for (const [name, value] of pairs) made.append(element("dt", {}, name), element("dd", {}, value));
    return made;
  }
  const isOwn = ([name, value]) => name !== "Childs" && name !== "disks" && (typeof value !== "object" || value.length > 0);
  const valueText = (value) => (Array.isArray(value) ? value.join(", ") : String(value)).replace(/[\u0000-\u001f]/g, "\ufffd");
  const properties = (node) =>
    list(Object.entries(node).filter(isOwn).filter(([, value]) => value !== "").map(([name, value]) => [name, valueText(value)]), "property");
  function below(node) {
    return (node.Childs ?? []).map((child) => element("details", { class: "below" },
      element("summary", {}, firstOf(child.FriendlyName, child.Description, child.VolumeName, child.InstanceId) || child.Type),
      properties(child), ...below(child)));
  }
  function wayTo(item) {
    const way = [];
    for (let at = item; at; at = at.parent) {
      way.unshift(at.kind === "controller" ? `Controller ${at.node.controller}` : at.port ? `port ${at.port}` : at.name);
    }
    return way.join(" › ");
  }
  function diskFacts(disk) {
    const mounted = (paths) => (paths.length ? paths.map((path) => path.replace(/\\$/, "")).join(", ") : "not mounted");
    const lines = disk.volumes.map((volume) => [mounted(volume.MountPoints), volume.VolumeName]);
    if (disk.mountPoints.length) lines.unshift([mounted(disk.mountPoints), "no volume"]);
    return [element("p", {}, disk.name), list(lines, "property")];
  }
  function detail({ node, name, about, kind, letters, ports, ...item }, way) {
    byId("details-title").textContent = name;
    const facts = [];
    if (kind === "device") {
      facts.push(["Vendor", vendorOf(node)], ["Id", idText(node)], ["Serial number", serialText(node) || "none of its own"],
                 ["Port path", node.portPath], ["Speed", onPort(node) && `${node.speed} speed`], ["Mounted at", node.mountPoints.join(", ")]);
    } else {
      const used = ports?.filter((port) => port.full).length;
      facts.push(["Vendor", vendorOf(node)], ["Id", idText(node)], ["Port path", node.portPath], ["Ports", ports && `${ports.length}, ${used} in use`]);
    }
    const parts = [element("p", { class: "way" }, way ?? wayTo({ node, kind, name, ...item })),
                   list(facts.filter(([, value]) => value))];
    if (node.disks?.length) parts.push(element("h3", {}, "Disks and volumes"), ...node.disks.flatMap(diskFacts));
    parts.push(element("h3", {}, "Properties"), properties(node));
    const rootHub = kind === "controller" ? node.Childs.filter((child) => child.Type === "KUDTHub") : [];
    for (const hub of rootHub) parts.push(element("h3", {}, "Root hub"), properties(hub));
    if (kind === "device" && node.Childs?.length) parts.push(element("h3", {}, "Below it in the device manager"), ...below(node));
    byId("details-body").replaceChildren(...parts);
    byId("details").scrollTop = 0;
  }

  // ---- Volumes.

  const volumes = [];
  for (const item of devices) {
    for (const disk of item.node.disks) {
      if (disk.mountPoints.length) volumes.push({ item, disk: disk.name, paths: disk.mountPoints, volume: "no volume" });
      for (const volume of disk.volumes) volumes.push({ item, disk: disk.name, paths: volume.MountPoints, volume: volume.VolumeName });
    }
  }
  volumes.sort((a, b) => (a.paths[0] ?? "~").localeCompare(b.paths[0] ?? "~"));
  function goTo(item, text) {
    const button = element("button", { type: "button", class: "go" }, text);
    button.addEventListener("click", () => reveal(item));
    return button;
  }
  if (volumes.length) {
    const head = element("tr", {}, ...["Letter", "Disk", "Device", "Port", "Volume"].map((text) => element("th", { scope: "col" }, text)));
    const rows = volumes.map(({ item, disk, paths, volume }) => element("tr", {},
      element("td", {}, paths.length ? element("span", { class: "letters" }, ...lettersOf(paths)) : element("span", { class: "quiet" }, "not mounted")),
      element("td", {}, disk), element("td", {}, goTo(item, item.name), element("span", { class: "about" }, item.about)),
      element("td", { class: "port" }, item.node.portPath), element("td", { class: "property" }, volume)));
    byId("volume-list").append(element("table", {}, element("thead", {}, head), element("tbody", {}, ...rows)));
  } else {
    byId("volumes").classList.add("empty");
    byId("volume-list").append(element("p", { class: "quiet" }, "No device carries a volume or a drive letter."));
  }

  // ---- Timeline.

  const words = { KDeviceConnected: "connected", KDeviceAttached: "attached", KDeviceRemoved: "removed", KDeviceModified: "modified" };
  const byInstance = new Map(devices.map((item) => [`${item.node.portPath}|${item.node.InstanceId}`, item]));
  const seconds = (at) => `${(at / 1000).toFixed(3)} s`;
  let told = 0;
  for (const step of data.timeline) {
    const line = element("li", {}, element("div", { class: "step" }, element("span", { class: "time" }, seconds(step.at)), step.step));
    for (const event of step.events) {
      ++told;
      const here = event.event === "KDeviceRemoved" ? null : byInstance.get(`${event.portPath}|${event.InstanceId}`);
      const name = element("button", { type: "button", class: "go" }, nameOf(event));
      name.addEventListener("click", () => {
        if (here) reveal(here);
        else {
          detail({ node: event, kind: "device", name: nameOf(event) }, `${words[event.event]} at ${seconds(event.at)}`);
          byId("details").focus();
        }
      });
      line.append(element("div", { class: "event" }, element("span", { class: `kind ${words[event.event]}` }, words[event.event]), name,
        element("span", { class: "quiet" }, [vendorOf(event), idText(event), event.portPath && `port ${event.portPath}`].filter(Boolean).join(" · ")),
        event.mountPoints.length ? element("span", { class: "letters" }, ...lettersOf(event.mountPoints)) : null,
        event.at !== step.at ? element("span", { class: "time" }, seconds(event.at)) : null));
    }
    const rest = [step.events.length ? "" : "Nothing came, went or changed.",
                  step.connected ? `${plural(step.connected, "connected device")} reported.` : ""].filter(Boolean).join(" ");
    if (rest) line.append(element("p", { class: "quiet" }, rest));
    byId("steps").append(line);
  }
  if (!data.timeline.length) {
    byId("timeline").classList.add("empty");
    byId("tab-timeline").hidden = true;
  }

  // ---- Views, colours, and what stands around.

  const views = ["topology", "volumes", "timeline"].filter((view) => !byId(`tab-${view}`).hidden);
  function showView(view) {
    for (const other of views) {
      const tab = byId(`tab-${other}`);
      byId(other).hidden = other !== view;
      tab.setAttribute("aria-selected", String(other === view));
      tab.setAttribute("tabindex", other === view ? "0" : "-1");
    }
  }
  for (const view of views) {
    const tab = byId(`tab-${view}`);
    tab.addEventListener("click", () => showView(view));
    tab.addEventListener("keydown", (event) => {
      const step = { ArrowRight: 1, ArrowLeft: views.length - 1 }[event.key];
      if (!step) return;
      const to = views[(views.indexOf(view) + step) % views.length];
      showView(to);
      byId(`tab-${to}`).focus();
    });
  }
  const count = (view, number) => byId(`tab-${view}`).append(element("span", { class: "count" }, String(number)));
  count("topology", devices.length);
  count("volumes", volumes.length);
  count("timeline", told);

  const dark = matchMedia("(prefers-color-scheme: dark)");
  function colour(theme) {
    document.documentElement.dataset.theme = theme;
    byId("theme").textContent = theme === "dark" ? "Light" : "Dark";
    byId("theme").setAttribute("aria-label", `Switch to ${theme === "dark" ? "light" : "dark"} colours`);
  }
  colour(dark.matches ? "dark" : "light");
  dark.addEventListener("change", () => colour(dark.matches ? "dark" : "light"));
  byId("theme").addEventListener("click", () => colour(document.documentElement.dataset.theme === "dark" ? "light" : "dark"));
  // Paper is white.
  let before = null;
  addEventListener("beforeprint", () => { before = document.documentElement.dataset.theme; colour("light"); });
  addEventListener("afterprint", () => before && colour(before));

  const letters = devices.reduce((sum, item) => sum + item.node.driveLetters.length, 0);
  byId("summary").textContent = [plural(controllers.length, "controller"), plural(hubs, "hub"), plural(devices.length, "device"),
                                 plural(letters, "drive letter")].join(" · ");
  byId("foot").textContent = `Written by zkusb ${data.version} on ${data.made}. Holds serial numbers as the PC has them.`;
  document.documentElement.dataset.ready = String(Math.round(performance.now() - start));
})();
