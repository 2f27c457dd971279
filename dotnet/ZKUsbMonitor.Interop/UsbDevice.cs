using System.Runtime.InteropServices;

namespace ZKUsbMonitor.Interop;

/// <summary>A device as values, which any thread may keep.</summary>
public sealed class UsbDevice
{
    /// <summary>What Windows calls this very device; the same when it comes again into the same socket.</summary>
    public required string InstanceId { get; init; }
    /// <summary>As the device or its disk names itself; empty when neither does.</summary>
    public required string Vendor { get; init; }
    /// <summary>As the device or its disk names itself, else what Windows calls it.</summary>
    public required string Product { get; init; }
    /// <summary>Empty when the device has none: what Windows makes up then is left out.</summary>
    public required string SerialNumber { get; init; }
    /// <summary>-1 when it is not known.</summary>
    public required int VendorId { get; init; }
    /// <summary>-1 when it is not known.</summary>
    public required int ProductId { get; init; }
    /// <summary>"F:\", or a folder, of each volume of the device.</summary>
    public required IReadOnlyList<string> MountPoints { get; init; }
    /// <summary>"F:" of each mount point that is a drive.</summary>
    public IReadOnlyList<string> DriveLetters =>
        MountPoints.Where(point => point.Length == 3 && point[1] == ':').Select(point => point[..2]).ToArray();

    internal static UsbDevice Read(IZKUMUsbTreeNode node)
    {
        var device = (IZKUMUsbDevice)node;
        var port = node as IZKUMPortDevice;
        string diskVendor = "", diskProduct = "";
        var points = new List<string>();
        foreach (IZKUMUsbTreeNode below in Nodes(node.get_InSubtreeDevicesOfType(UsbDeviceType.InterfaceDevice)))
        {
            if (below is not IZKUMInterfaceDevice disk) continue;
            diskVendor = FirstOf(diskVendor, disk.get_VendorId());
            diskProduct = FirstOf(diskProduct, disk.get_ProductId());
            var list = disk.get_MountPoints();
            var point = new object[1];
            while (list.Next(1, point, IntPtr.Zero) == 0)
            {
                if (point[0] is string text && text.Length != 0 && !points.Contains(text)) points.Add(text);
            }
        }
        string serial = device.get_SerialNumber() ?? "";
        return new UsbDevice
        {
            InstanceId = node.get_InstanceId() ?? "",
            Vendor = FirstOf(port?.get_Manufacturer1(), diskVendor),
            Product = FirstOf(port?.get_Product(), diskProduct, device.get_Description()),
            SerialNumber = serial.Contains('&') ? "" : serial,
            VendorId = device.get_VendorId(),
            ProductId = device.get_ProductId(),
            MountPoints = points,
        };
    }

    internal static IEnumerable<IZKUMUsbTreeNode> Nodes(IZKUMUsbTreeNodeEnumerator list)
    {
        while (list.MoveNext()) yield return list.GetCurrent();
    }

    private static string FirstOf(params string?[] texts) =>
        texts.Select(text => (text ?? "").Trim()).FirstOrDefault(text => text.Length != 0) ?? "";
}
