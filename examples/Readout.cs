// A host program in C#: takes a readout and shows it.
//
//     Readout.exe [INSTRUMENT]
//
// On Windows: platform target x86, because ostra.dll is a 32-bit library. The name "ostra" finds ostra.dll there, and
// libostra.so on Linux.
using System;
using System.Runtime.InteropServices;

static class Readout
{
    const int ReadoutValues = 128;

    [DllImport("ostra", CallingConvention = CallingConvention.Cdecl, CharSet = CharSet.Ansi)]
    static extern int d4fb86cecc88582a([Out] int[] values, string instrument);

    // The text belongs to the library: never free it.
    [DllImport("ostra", CallingConvention = CallingConvention.Cdecl, CharSet = CharSet.Ansi)]
    static extern IntPtr b5ae189db26b2a1b(string key);

    static int Main(string[] arguments)
    {
        var values = new int[ReadoutValues];
        if (d4fb86cecc88582a(values, arguments.Length > 0 ? arguments[0] : "") != 0)
        {
            string reason = Marshal.PtrToStringAnsi(b5ae189db26b2a1b("LastError"));
            Console.Error.WriteLine("no readout: " + (reason != "" ? reason : "no such instrument is connected"));
            return 1;
        }
        for (int i = 0; i < ReadoutValues; i++)
            Console.Write("{0,6}{1}", values[i], i % 8 == 7 ? "\n" : " ");
        return 0;
    }
}
