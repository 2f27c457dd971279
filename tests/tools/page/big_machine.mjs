// A machine file with any number of devices: sticks, keyboards and
// devices of two functions on hubs of up to eight ports.
//
//   node big_machine.mjs FILE DEVICES [CONTROLLERS]
import { writeFileSync } from "node:fs";

const usbClass = "{36fc9e60-c465-11cf-8056-444553540000}";
const diskInterface = "{53f56307-b6bf-11d0-94f2-00a0c91efb8b}";
const volumeInterface = "{53f5630d-b6bf-11d0-94f2-00a0c91efb8b}";
const hubInterface = "{f18a0e88-c30c-11d0-8815-00a0c906bed8}";
const hex = (number, digits) => number.toString(16).toUpperCase().padStart(digits, "0");

export function bigMachine(devices, controllers = 10) {
  const machine = { name: `${devices} devices`, devices: [{ id: "ROOT\\VOLMGR\\0000" }], interfaces: [], hostControllers: [], hubs: [],
                    storage: [], volumes: [], drives: [] };
  let number = 0;
  const driver = () => `${usbClass}\\${hex(number++, 4)}`;
  const usb = (id, parent, description, more = {}) => {
    const key = driver();
    machine.devices.push({ id, parent, class: "USB", classGuid: usbClass, driver: key, enumerator: "USB",
                           legacyBusType: 15, description, hardwareIds: [id.slice(0, id.lastIndexOf("\\"))], ...more });
    return key;
  };
  const port = (driverKey, vendor, product) =>
    ({ speed: "high", driverKey, descriptor: { idVendor: vendor, idProduct: product }, address: 1 });
  const letters = [..."DEFGHIJKLMNOPQRSTUVWXYZ"];

  const stick = (parent, at) => {
    const serial = `S${hex(at, 8)}`;
    const id = `USB\\VID_0781&PID_5580\\${serial}`;
    const disk = `USBSTOR\\DISK&VEN_SANDISK&PROD_EXTREME&REV_0001\\${serial}&0`;
    const path = `USBSTOR#Disk&Ven_SanDisk&Prod_Extreme&Rev_0001#${serial}&0#${diskInterface}`;
    const volume = `STORAGE\\VOLUME\\_??_${path.toUpperCase()}`;
    const name = `\\\\?\\Volume{00000000-0000-0000-0000-${hex(at, 12).toLowerCase()}}\\`;
    const letter = letters.shift();
    const key = usb(id, parent, "USB Mass Storage Device", { service: "USBSTOR" });
    machine.devices.push(
      { id: disk, parent: id, class: "DiskDrive", classGuid: "{4d36e967-e325-11ce-bfc1-08002be10318}", service: "disk",
        driver: `{4d36e967-e325-11ce-bfc1-08002be10318}\\${hex(at, 4)}`, enumerator: "USBSTOR", description: "Disk drive",
        friendlyName: `SanDisk Extreme ${at} USB Device` },
      { id: volume, parent: "ROOT\\VOLMGR\\0000", class: "Volume", classGuid: "{71a27cdd-812a-11d0-bec7-08002be2092f}", enumerator: "STORAGE",
        driver: `{71a27cdd-812a-11d0-bec7-08002be2092f}\\${hex(at, 4)}`, description: "Generic volume" });
    const volumePath = `STORAGE#Volume#_??_${path}#${volumeInterface}`;
    machine.interfaces.push({ class: diskInterface, path: `\\\\?\\${path}`, device: disk },
                            { class: volumeInterface, path: `\\\\?\\${volumePath}`, device: volume });
    const about = { deviceType: 0, removable: true, vendor: "SanDisk ", product: "Extreme         ", revision: "0001",
                    serial, deviceNumber: { type: 7, number: at, partition: 0 } };
    machine.storage.push({ path: `\\\\?\\${path}`, ...about },
                         { path: `\\\\?\\${volumePath}`, ...about, deviceNumber: { type: 7, number: at, partition: 1 } });
    machine.volumes.push({ name, device: volume, driveType: "removable", paths: letter ? [`${letter}:\\`] : [] });
    if (!letter) return port(key, "0x0781", "0x5580");
    machine.storage.push({ ...machine.storage.at(-1), path: `\\\\.\\${letter}:` });
    machine.drives.push({ letter, type: "removable", device: disk });
    return port(key, "0x0781", "0x5580");
  };
  const others = [
    (parent, at) => port(usb(`USB\\VID_046D&PID_C31C\\6&${hex(at, 8)}&0&1`, parent, "USB Input Device",
                             { service: "HidUsb", class: "HIDClass" }), "0x046D", "0xC31C"),
    (parent, at) => port(usb(`USB\\VID_0C45&PID_643F\\6&${hex(at, 8)}&0&2`, parent, "USB Composite Device",
                             { service: "usbccgp" }), "0x0C45", "0x643F"),
  ];

  let made = 0;
  for (let index = 0; index < controllers; ++index) {
    const controller = `PCI\\VEN_8086&DEV_1E31&SUBSYS_05341028&REV_04\\3&11583659&0&${hex(0x100 + index, 4)}`;
    const driverKey = usb(controller, undefined, "USB xHCI Compliant Host Controller", { enumerator: "PCI" });
    delete machine.devices.at(-1).parent;
    const hubId = `USB\\ROOT_HUB30\\4&${hex(index, 8)}&0&0`;
    const hubName = (id) => `${id.replaceAll("\\", "#")}#${hubInterface}`;
    usb(hubId, controller, "USB Root Hub", { service: "usbhub" });
    const rootHub = hubName(hubId);
    machine.interfaces.push({ class: hubInterface, path: `\\\\?\\${rootHub}`, device: hubId });
    const link = `PCI#VEN_8086&DEV_1E31&SUBSYS_05341028&REV_04#3&11583659&0&${hex(0x100 + index, 4)}`;
    machine.interfaces.push({ class: "{3abf6f2d-71c4-462a-8a92-1e6861e6af27}", device: controller,
                              path: `\\\\?\\${link}#{3abf6f2d-71c4-462a-8a92-1e6861e6af27}` });
    machine.hostControllers.push({ names: [`\\\\.\\HCD${index}`, machine.interfaces.at(-1).path], driverKey, rootHub });
    const share = Math.floor((devices - made) / (controllers - index));
    const device = (parent) => (++made % 3 === 1 ? stick : others[made % 2])(parent, made);
    // Three devices, a free port, and hubs for the others.
    const fill = (parent, count) => {
      const ports = [];
      for (let at = Math.min(count, count > 6 ? 3 : 6); at > 0; --at) ports.push(device(parent));
      ports.push({});
      let left = count - ports.length + 1;
      for (let hubs = Math.min(4, Math.ceil(left / 6)); hubs > 0; --hubs) {
        const share = Math.ceil(left / hubs);
        const id = `USB\\VID_0424&PID_2514\\5&${hex(number, 8)}&0&3`;
        const key = usb(id, parent, "Generic USB Hub", { service: "usbhub" });
        const name = hubName(id);
        machine.interfaces.push({ class: hubInterface, path: `\\\\?\\${name}`, device: id });
        machine.hubs.push({ name, ports: fill(id, share) });
        ports.push({ ...port(key, "0x0424", "0x2514"), hubName: name });
        left -= share;
      }
      return ports;
    };
    const ports = fill(hubId, share);
    machine.hubs.push({ name: rootHub, ports: [...ports, {}, {}] });
  }
  return machine;
}

if (process.argv[1]?.endsWith("big_machine.mjs")) {
  const [file, devices, controllers] = process.argv.slice(2);
  writeFileSync(file, JSON.stringify(bigMachine(Number(devices), controllers && Number(controllers))));
}
