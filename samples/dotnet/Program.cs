// Prints each USB stick with its drive letter, then what comes and goes, for as many seconds as are given:
// sticks SECONDS [DLL OVER A SIMULATED PC]
using ZKUsbMonitor.Interop;

void Print(string what, UsbDevice device)
{
    if (device.DriveLetters.Count == 0) return;
    Console.WriteLine($"{what}: {device.Vendor} {device.Product} ({string.Join(", ", device.DriveLetters)}), " +
                      $"serial {device.SerialNumber}");
}

using var watcher = new UsbWatcher(args.Length > 1 ? args[1] : "ZKUsbMonitor.dll");
watcher.DeviceAttached += (_, told) => Print("attached", told.Device);
watcher.DeviceRemoved += (_, told) => Print("removed", told.Device);
watcher.Start();
foreach (UsbDevice device in watcher.Devices()) Print("there", device);
Thread.Sleep(args.Length > 0 ? 1000 * int.Parse(args[0]) : Timeout.Infinite);
