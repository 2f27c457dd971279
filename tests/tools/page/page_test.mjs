// The page of zkusb in a real browser.
//
//   node page_test.mjs MODULES ZKUSB SOURCE OUTPUT
//
// MODULES is a folder with node_modules, ZKUSB the client, SOURCE the project's folder; screenshots and pages go into
// OUTPUT. Ends with 0 when all checks passed. It counts them, so that none can go missing unseen.
import assert from "node:assert/strict";
import { execFileSync } from "node:child_process";
import { existsSync, mkdirSync, readFileSync, rmSync, writeFileSync } from "node:fs";
import { createRequire } from "node:module";
import { join } from "node:path";
import { pathToFileURL } from "node:url";
import { bigMachine } from "./big_machine.mjs";

const [modules, zkusb, source, output] = process.argv.slice(2);
const require = createRequire(join(modules, "node_modules", "any.js"));
const { chromium } = require("playwright-core");
const axe = readFileSync(require.resolve("axe-core/axe.min.js"), "utf8");
mkdirSync(output, { recursive: true });

const machine = (name) => join(source, "machines", `${name}.json`);
const planted = `<script>document.title="taken"</script><img src=x onerror=alert(1)></script><!--`;

function writePage(name, ...args) {
  const file = join(output, `${name}.html`);
  execFileSync(zkusb, ["page", file, ...args]);
  return file;
}
function writeMachine(name, change) {
  const text = JSON.parse(readFileSync(machine("dell-precision")));
  change(text);
  const file = join(output, `${name}.json`);
  writeFileSync(file, JSON.stringify(text));
  return file;
}

const profile = join(output, "profile");
rmSync(profile, { recursive: true, force: true });
const browser = await chromium.launchPersistentContext(profile, {
  executablePath: ["/usr/bin/chromium", "/usr/bin/chromium-browser"].find(existsSync),
  headless: true,
  viewport: { width: 1360, height: 900 },
  args: ["--no-sandbox", "--disable-gpu", "--disable-quic", "--no-first-run", "--disable-background-networking",
         "--disable-component-update", "--disable-sync"],
});

const problems = [];
async function open(file, scheme = "light") {
  const page = await browser.newPage();
  await page.emulateMedia({ colorScheme: scheme });
  page.on("console", (message) => problems.push(`${file}: ${message.text()}`));
  page.on("pageerror", (error) => problems.push(`${file}: ${error}`));
  page.on("request", (request) => request.url().startsWith("file:") || problems.push(`${file}: asks for ${request.url()}`));
  page.on("dialog", (dialog) => problems.push(`${file}: ${dialog.message()}`));
  await page.goto(pathToFileURL(file).href);
  await page.waitForFunction(() => document.documentElement.dataset.ready !== undefined);
  return page;
}
async function violations(page) {
  // A script that the page's own policy would refuse, were it not for the driver.
  await page.evaluate(axe);
  const result = await page.evaluate(() => axe.run(document, { resultTypes: ["violations"] }));
  return result.violations.map((found) => `${found.id}: ${found.nodes.map((node) => node.html.slice(0, 200)).join(" | ")}`);
}
const shown = (page) => page.locator("[role=treeitem]:visible .name").allTextContents();
const selected = (page) => page.textContent("[role=treeitem][aria-selected=true]");
const focused = (page) => page.evaluate(() => document.activeElement.textContent);
async function press(page, ...keys) {
  for (const key of keys) await page.keyboard.press(key);
}

const checks = {
  async "shows the PC at a glance, light and dark, without a violation"() {
    const file = writePage("notebook", "--script", join(source, "machines/scripts/stick-comes-and-goes.json"));
    for (const scheme of ["light", "dark"]) {
      const page = await open(file, scheme);
      assert.equal(await page.textContent("#summary"), "3 controllers · 2 hubs · 3 devices · 1 drive letter");
      assert.deepEqual((await shown(page)).length, 8);
      assert.deepEqual(await violations(page), []);
      await page.locator(".row", { hasText: "USB Mass Storage" }).click();
      assert.match(await page.textContent("#details"), /Serial numberAA010603160707470215.*Port path1-3.*Mounted atD:\\/s);
      await page.screenshot({ path: join(output, `${scheme}.png`) });
      for (const view of ["volumes", "timeline"]) {
        await page.click(`#tab-${view}`);
        assert.deepEqual(await violations(page), []);
        await page.screenshot({ path: join(output, `${scheme}-${view}.png`) });
      }
      await page.close();
    }
  },
  async "finds a device by letter, name and id"() {
    const page = await open(join(output, "notebook.html"));
    for (const [text, found, matches] of [["D:", "USB Mass Storage Device", "1 match"], ["wireless", "Dell Wireless 380 Bluetooth 4.0 Module", "1 match"],
                                          ["0c45:643f", "USB Composite Device", "1 match"], ["sandisk extreme", "USB Mass Storage Device", "1 match"]]) {
      await page.fill("#search", text);
      assert.equal(await page.textContent("#matches"), matches);
      const names = await shown(page);
      assert.equal(names.at(-1), found);
      assert.ok(names.length <= 3, `${names}`);
      await press(page, "Enter");
      assert.ok((await selected(page)).includes(found));
      assert.deepEqual(await violations(page), []);
    }
    await page.fill("#search", "Z:");
    assert.equal(await page.textContent("#matches"), "No match");
    assert.ok(await page.isVisible("text=Nothing on this PC matches."));
    await page.locator("#search").press("Escape");
    assert.equal((await shown(page)).length, 8);
    await page.close();
  },
  async "folds, and goes where keys lead"() {
    const page = await open(join(output, "notebook.html"));
    await page.click("#fold");
    assert.equal((await shown(page)).length, 3);
    assert.equal(await page.locator("[role=treeitem][tabindex='0']").count(), 1);
    await page.locator("[role=treeitem]").first().focus();
    await press(page, "ArrowRight", "ArrowRight");
    assert.match(await focused(page), /^Port 3 USB Mass Storage Device .* on D: full speed$/);
    await press(page, "ArrowLeft", "ArrowLeft");
    assert.equal((await shown(page)).length, 3);
    await press(page, "End", "*", "ArrowRight");
    assert.match(await focused(page), /^Port 1 Hub .*8 ports, 0 in use/);
    await press(page, "Home");
    assert.match(await focused(page), /xHCI/);
    await press(page, "ArrowDown", "ArrowDown", "ArrowDown", "ArrowUp", "Enter");
    assert.match(await selected(page), /1E2D/);
    await press(page, "ArrowDown", "ArrowRight", "d");
    assert.match(await focused(page), /Dell Wireless/);
    assert.equal(await page.locator("[role=treeitem][tabindex='0']").count(), 1);
    await page.locator("[role=treeitem] .fold").first().click();
    assert.equal(await page.locator("[role=treeitem]").first().getAttribute("aria-expanded"), "false");
    await page.click("#unfold");
    assert.equal((await shown(page)).length, 8);
    await page.focus("#tab-topology");
    await press(page, "ArrowRight");
    assert.ok(await page.isVisible("#volumes table"));
    await page.click("#volumes .go");
    assert.match(await focused(page), / on D:/);
    await page.close();
  },
  async "tells what happened, and shows what is gone"() {
    const page = await open(join(output, "notebook.html"));
    await page.click("#tab-timeline");
    assert.deepEqual(await page.locator(".kind").allTextContents(), ["attached", "modified", "removed", "modified"]);
    await page.locator(".event .go").first().click();
    assert.match(await page.textContent("#details"), /60A44C413FD1B2A1C9A60135/);
    await page.close();
  },
  async "keeps names from becoming markup"() {
    const file = writePage("planted", "--machine", writeMachine("planted", (text) => {
      for (const device of text.devices) {
        if (!device.id.includes("413C") && !device.id.includes("SANDISK")) continue;
        device.description = planted;
        if (device.friendlyName) device.friendlyName = planted;
      }
    }));
    const page = await open(file);
    assert.equal(await page.title(), "USB topology");
    assert.equal(await page.locator("img").count(), 0);
    assert.equal(await page.locator("script").count(), 2);
    assert.ok((await shown(page)).includes(planted));
    await page.locator(".row", { hasText: "onerror" }).last().click();
    assert.equal(await page.textContent("#details-title"), planted);
    await page.click("#tab-volumes");
    assert.ok((await page.textContent("#volumes")).includes(planted));
    assert.deepEqual(await violations(page), []);
    await page.close();
  },
  async "shows a PC without USB as empty"() {
    const machineFile = join(output, "none.json");
    writeFileSync(machineFile, "{}");
    const file = join(output, "none.html");
    assert.throws(() => execFileSync(zkusb, ["page", file, "--machine", machineFile], { stdio: "pipe" }), { status: 1 });
    const page = await open(file);
    assert.ok(await page.isVisible("text=No USB device was found on this PC."));
    assert.deepEqual(await violations(page), []);
    await page.close();
  },
  async "stays fluid with 1,000 devices"() {
    const machineFile = join(output, "thousand.json");
    writeFileSync(machineFile, JSON.stringify(bigMachine(1000)));
    const page = await open(writePage("thousand", "--machine", machineFile));
    assert.match(await page.textContent("#summary"), / 1000 devices · 23 drive letters/);
    await page.screenshot({ path: join(output, "thousand.png") });
    const times = { build: Number(await page.evaluate(() => document.documentElement.dataset.ready)) };
    const timed = async (name, act) => {
      times[name] = await page.evaluate(async (code) => {
        const start = performance.now();
        new Function(code)();
        await new Promise((done) => requestAnimationFrame(() => requestAnimationFrame(done)));
        return Math.round(performance.now() - start);
      }, act);
    };
    const type = (text) => `const box = document.getElementById("search"); box.value = "${text}"; box.dispatchEvent(new Event("input"));`;
    await timed("search", type("sandisk"));
    assert.equal(await page.textContent("#matches"), "334 matches");
    await timed("clear", type(""));
    await timed("fold", `document.getElementById("fold").click()`);
    await timed("unfold", `document.getElementById("unfold").click()`);
    await timed("choose", `document.querySelectorAll(".device > .row")[900].click()`);
    console.log(`  milliseconds: ${JSON.stringify(times)}`);
    // Machines differ; what grows with the square of the devices would take minutes.
    for (const [name, time] of Object.entries(times)) assert.ok(time < 5000, `${name}: ${time} ms`);
    await page.fill("#search", "Z:");
    await press(page, "Enter");
    assert.match(await selected(page), / on Z:/);
    await page.screenshot({ path: join(output, "thousand-found.png") });
    await page.close();
  },
  async "prints everything on paper"() {
    const page = await open(join(output, "notebook.html"), "dark");
    await page.click("#fold");
    await page.emulateMedia({ media: "print" });
    await page.evaluate(() => dispatchEvent(new Event("beforeprint")));
    assert.equal((await shown(page)).length, 8);
    for (const part of ["#volumes table", "#steps"]) assert.ok(await page.isVisible(part));
    for (const part of ["#search", "#details", "#fold"]) assert.ok(!(await page.isVisible(part)));
    assert.equal(await page.evaluate(() => document.documentElement.dataset.theme), "light");
    await page.pdf({ path: join(output, "print.pdf"), format: "A4" });
    await page.setViewportSize({ width: 794, height: 1123 });
    await page.screenshot({ path: join(output, "print.png"), fullPage: true });
    await page.close();
  },
};

let failed = 0;
for (const [name, check] of Object.entries(checks)) {
  try {
    await check();
    assert.deepEqual(problems.splice(0), []);
    console.log(`ok      ${name}`);
  } catch (error) {
    ++failed;
    problems.length = 0;
    console.log(`FAILED  ${name}\n${error.stack}`);
  }
}
await browser.close();
rmSync(profile, { recursive: true, force: true });
console.log(`${Object.keys(checks).length - failed} of ${Object.keys(checks).length} checks passed`);
process.exit(failed === 0 ? 0 : 1);
