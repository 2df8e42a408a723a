// Reads Rcvlink.cs as it was compiled, and prints what it says of the library:
//   Describe ASSEMBLY HEADER ENTRIES
// HEADER becomes C++ that compiles when rcvlink.h says the same, ENTRIES the entry points with their methods.
using System;
using System.Collections.Generic;
using System.IO;
using System.Linq;
using System.Reflection;
using System.Runtime.InteropServices;

static class Describe
{
    const BindingFlags Fields = BindingFlags.Instance | BindingFlags.Public | BindingFlags.NonPublic;
    const BindingFlags Functions = BindingFlags.Static | BindingFlags.Public | BindingFlags.NonPublic;

    static void Main(string[] arguments)
    {
        Assembly assembly = Assembly.LoadFrom(arguments[0]);
        File.WriteAllLines(arguments[1], Header(assembly));
        File.WriteAllLines(arguments[2], Methods(assembly).Select(Entry));
    }

    static IEnumerable<MethodInfo> Methods(Assembly assembly)
    {
        return assembly.GetType("Rcvlink.NativeMethods", true).GetMethods(Functions);
    }

    static string Entry(MethodInfo method)
    {
        return method.GetCustomAttribute<DllImportAttribute>().EntryPoint + " " + method.Name;
    }

    static IEnumerable<string> Header(Assembly assembly)
    {
        Type[] types = assembly.GetTypes();
        return new[] { "#include \"agreement.h\"" }
            .Concat(types.Where(type => type.IsEnum).SelectMany(Enumeration))
            .Concat(types.Where(type => type.IsExplicitLayout).SelectMany(Record))
            .Concat(Methods(assembly).Select(Function));
    }

    static IEnumerable<string> Enumeration(Type type)
    {
        yield return Agree("sizeof({0}) == {1}", type.Name, SizeOf(type));
        foreach (object value in Enum.GetValues(type))
        {
            yield return Agree("{0}::{1} == {2}", type.Name, value, (int)value);
        }
    }

    static IEnumerable<string> Record(Type type)
    {
        FieldInfo[] fields = type.GetFields(Fields);
        yield return Agree("sizeof({0}) == {1}", type.Name, Marshal.SizeOf(type));
        yield return Agree("FieldCount<{0}>() == {1}", type.Name, fields.Length);
        foreach (FieldInfo field in fields)
        {
            IntPtr offset = Marshal.OffsetOf(type, field.Name);
            yield return Agree("offsetof({0}, {1}) == {2}", type.Name, field.Name, offset);
            yield return Agree("sizeof({0}::{1}) == {2}", type.Name, field.Name, SizeOf(field.FieldType));
        }
    }

    static string Function(MethodInfo method)
    {
        var sizes = method.GetParameters().Select(parameter => SizeOf(parameter.ParameterType));
        return Agree("IsLike(&RcvlinkFunctions::{0}, {1}, {{{2}}})",
                     method.Name,
                     SizeOf(method.ReturnType),
                     string.Join(", ", sizes));
    }

    static string Agree(string condition, params object[] values)
    {
        condition = string.Format(condition, values);
        return string.Format("static_assert({0}, \"Rcvlink.cs differs from rcvlink.h\");", condition);
    }

    // How many bytes native code sees of it.
    static int SizeOf(Type type)
    {
        if (type == typeof(void)) return 0;
        if (type.IsByRef || type.IsClass || type.IsInterface) return IntPtr.Size;
        return Marshal.SizeOf(type.IsEnum ? Enum.GetUnderlyingType(type) : type);
    }
}
