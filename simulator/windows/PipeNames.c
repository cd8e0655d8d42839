/* The names of the pipes. A host opens the listed path of the device with "\PIPE01" to "\PIPE03" behind it.
 * Wine looks nothing up below a device and does not tell the driver the rest of a path either, so each pipe
 * is a device of its own, and the names lead there:
 *
 * The listed path is "\\.\NAME " with a blank behind it. Opened as it is, it loses the blank and is the link
 * \??\NAME that Wine makes for the device interface. With a pipe behind it, it keeps the blank, and "\??\NAME
 * " is a directory made here, with a link for each pipe.
 *
 * The enumeration lists what the registry says of the interface class; of two entries for one device the
 * later one wins, so a second entry with the other path is all it takes. */
#include "Driver.h"

#if PIPE_COUNT > 0

#define NAME_LENGTH 512 /* characters; far more than any of these names */

typedef struct {
    UNICODE_STRING text;
    WCHAR buffer[NAME_LENGTH];
} Name;

static UNICODE_STRING* StartName(Name* name, const WCHAR* text) {
    name->text.Length = 0;
    name->text.MaximumLength = sizeof name->buffer;
    name->text.Buffer = name->buffer;
    RtlAppendUnicodeToString(&name->text, text);
    return &name->text;
}

static void AppendDigits(UNICODE_STRING* name, ULONG number) {
    WCHAR digits[11];
    int i = 10;
    digits[i] = 0;
    do {
        digits[--i] = (WCHAR)(L'0' + number % 10);
        number /= 10;
    } while (number != 0);
    RtlAppendUnicodeToString(name, digits + i);
}

/* NAME of the device interface: the link without its \??\. */
static UNICODE_STRING InterfaceName(const DeviceExtension* extension) {
    UNICODE_STRING name = extension->link;
    name.Buffer += 4;
    name.Length = (USHORT)(name.Length - 4 * sizeof(WCHAR));
    return name;
}

/* Where the braces with the interface class begin, in characters. */
static ULONG ClassBegin(const UNICODE_STRING* name) {
    ULONG begin = name->Length / sizeof(WCHAR);
    while (begin > 0 && name->Buffer[begin - 1] != L'{')
        --begin;
    return begin - 1;
}

static UNICODE_STRING* PipeDirectory(Name* name, const DeviceExtension* extension) {
    const UNICODE_STRING interface = InterfaceName(extension);
    UNICODE_STRING* const text = StartName(name, L"\\??\\");
    RtlAppendUnicodeStringToString(text, &interface);
    RtlAppendUnicodeToString(text, L" ");
    return text;
}

static UNICODE_STRING* PipeLink(Name* name, const DeviceExtension* extension, ULONG pipe) {
    UNICODE_STRING* const text = PipeDirectory(name, extension);
    RtlAppendUnicodeToString(text, L"\\PIPE0");
    AppendDigits(text, pipe);
    return text;
}

static UNICODE_STRING* PipeDevice(Name* name, const DeviceExtension* extension, ULONG pipe) {
    UNICODE_STRING* const text = StartName(name, L"\\Device\\OstraStandIn");
    AppendDigits(text, extension->index);
    RtlAppendUnicodeToString(text, L"Pipe");
    AppendDigits(text, pipe);
    return text;
}

static NTSTATUS OpenKey(const UNICODE_STRING* path, ULONG options, HANDLE* key) {
    OBJECT_ATTRIBUTES attributes;
    InitializeObjectAttributes(&attributes, (UNICODE_STRING*)path, OBJ_KERNEL_HANDLE | OBJ_CASE_INSENSITIVE,
                               NULL, NULL);
    return ZwCreateKey(key, KEY_ALL_ACCESS, &attributes, 0, NULL, options, NULL);
}

static NTSTATUS SetText(HANDLE key, const WCHAR* valueName, UNICODE_STRING* text) {
    UNICODE_STRING name;
    RtlInitUnicodeString(&name, valueName);
    text->Buffer[text->Length / sizeof(WCHAR)] = 0;
    return ZwSetValueKey(key, &name, 0, REG_SZ, text->Buffer, text->Length + sizeof(WCHAR));
}

/* The second entry of the interface in the registry; `linked` says whether it is to be listed. */
static NTSTATUS WriteEntry(const DeviceExtension* extension, ULONG linked) {
    const UNICODE_STRING interface = InterfaceName(extension);
    const ULONG classBegin = ClassBegin(&interface);
    UNICODE_STRING class = interface;
    class.Buffer += classBegin;
    class.Length = (USHORT)(class.Length - classBegin * sizeof(WCHAR));

    Name path, value;
    UNICODE_STRING valueName;
    HANDLE key;
    StartName(&path, L"\\Registry\\Machine\\System\\CurrentControlSet\\Control\\DeviceClasses\\");
    RtlAppendUnicodeStringToString(&path.text, &class);
    RtlAppendUnicodeToString(&path.text, L"\\##?#z"); /* sorts behind the entry that Wine makes */
    RtlAppendUnicodeStringToString(&path.text, &interface);
    NTSTATUS status = OpenKey(&path.text, 0, &key);
    if (status != STATUS_SUCCESS)
        return status;
    StartName(&value, L"");
    RtlAppendUnicodeStringToString(&value.text, &interface);
    value.text.Length = (USHORT)((classBegin - 1) * sizeof(WCHAR));
    for (ULONG i = 0; i < classBegin - 1; ++i)
        if (value.buffer[i] == L'#')
            value.buffer[i] = L'\\';
    status = SetText(key, L"DeviceInstance", &value.text);
    ZwClose(key);

    RtlAppendUnicodeToString(&path.text, L"\\#");
    if (status != STATUS_SUCCESS || (status = OpenKey(&path.text, 0, &key)) != STATUS_SUCCESS)
        return status;
    StartName(&value, L"\\\\.\\");
    RtlAppendUnicodeStringToString(&value.text, &interface);
    RtlAppendUnicodeToString(&value.text, L" ");
    status = SetText(key, L"SymbolicLink", &value.text);
    ZwClose(key);

    RtlAppendUnicodeToString(&path.text, L"\\Control");
    if (status != STATUS_SUCCESS ||
        (status = OpenKey(&path.text, REG_OPTION_VOLATILE, &key)) != STATUS_SUCCESS)
        return status;
    RtlInitUnicodeString(&valueName, L"Linked");
    status = ZwSetValueKey(key, &valueName, 0, REG_DWORD, &linked, sizeof linked);
    ZwClose(key);
    return status;
}

static NTSTATUS MakePipe(DEVICE_OBJECT* device, ULONG pipe) {
    DeviceExtension* const extension = ExtensionOf(device);
    Name deviceName, linkName;
    DEVICE_OBJECT* made;
    PipeDevice(&deviceName, extension, pipe);
    NTSTATUS status = IoCreateDevice(device->DriverObject, sizeof(DeviceExtension), &deviceName.text,
                                     FILE_DEVICE_UNKNOWN, 0, FALSE, &made);
    if (status != STATUS_SUCCESS)
        return status;
    RtlZeroMemory(ExtensionOf(made), sizeof(DeviceExtension));
    ExtensionOf(made)->instrument = extension->instrument;
    ExtensionOf(made)->pipe = pipe;
    made->Flags |= DO_BUFFERED_IO;
    made->Flags &= ~(ULONG)DO_DEVICE_INITIALIZING;
    extension->pipes[pipe - 1] = made;
    return IoCreateSymbolicLink(PipeLink(&linkName, extension, pipe), &deviceName.text);
}

NTSTATUS ShowPipes(DEVICE_OBJECT* device) {
    DeviceExtension* const extension = ExtensionOf(device);
    Name name;
    OBJECT_ATTRIBUTES attributes;
    InitializeObjectAttributes(&attributes, PipeDirectory(&name, extension), OBJ_KERNEL_HANDLE, NULL, NULL);
    NTSTATUS status = ZwCreateDirectoryObject(&extension->pipeDirectory, DIRECTORY_ALL_ACCESS, &attributes);
    for (ULONG pipe = 1; pipe <= PIPE_COUNT && status == STATUS_SUCCESS; ++pipe)
        status = MakePipe(device, pipe);
    return status == STATUS_SUCCESS ? WriteEntry(extension, 1) : status;
}

void HidePipes(DEVICE_OBJECT* device) {
    DeviceExtension* const extension = ExtensionOf(device);
    WriteEntry(extension, 0);
    for (ULONG pipe = 1; pipe <= PIPE_COUNT; ++pipe) {
        DEVICE_OBJECT* const pipeDevice = extension->pipes[pipe - 1];
        Name name;
        if (!pipeDevice)
            continue;
        IoDeleteSymbolicLink(PipeLink(&name, extension, pipe));
        ExtensionOf(pipeDevice)->instrument = NULL;
        if (ExtensionOf(pipeDevice)->openFiles == 0)
            IoDeleteDevice(pipeDevice);
    }
    if (extension->pipeDirectory)
        ZwClose(extension->pipeDirectory);
    extension->pipeDirectory = NULL;
}

#else

NTSTATUS ShowPipes(DEVICE_OBJECT* device) {
    (void)device;
    return STATUS_SUCCESS;
}

void HidePipes(DEVICE_OBJECT* device) {
    (void)device;
}

#endif
