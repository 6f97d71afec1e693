// filled_documents.cs - clients that Mono made from the WSDL: documents whose every member is filled go to
// the service, are got again and compared member by member. Usage: filled_documents.exe ADDRESS. Prints what
// differs, and exits with 1 then.
using System;
using System.Collections;
using System.Collections.Generic;
using System.Linq;
using System.Reflection;
using System.Web.Services.Protocols;
using System.Xml.Serialization;

static class FilledDocuments
{
    const int DEPTH = 3; // objects within each other; the contract nests without end
    const string REFERENCE = "dataHandler"; // to what comes with the message
    static readonly string[] OF_THE_SERVICE = {
        "thisURI", "state", "submitDateTime", "lastModifiedDateTime", "answer", "error", "updateIdExpansion", "updateIdExpansionDetail"};
    static int filled, wrong; // what is filled depends on the order, which is by name everywhere: Mono's own differs from run to run

    static IEnumerable<PropertyInfo> Members(Type type)
    {
        return type.GetProperties().Where(one => one.CanRead && one.CanWrite && one.Name != REFERENCE)
            .OrderBy(one => one.Name, StringComparer.Ordinal);
    }

    static object Value(Type type, string name, int depth)
    {
        ++filled;
        type = Nullable.GetUnderlyingType(type) ?? type;
        if (type == typeof(string)) return name + " <&> Zo\u00eb " + filled;
        if (type == typeof(bool)) return true;
        if (type == typeof(byte[])) return new byte[] {0, 1, 254, 255};
        if (type == typeof(DateTime)) return new DateTime(2024, 2, 29, 12, 0, filled % 60, DateTimeKind.Utc);
        if (type.IsEnum) return Enum.GetValues(type).GetValue(filled % Enum.GetValues(type).Length);
        if (type.IsPrimitive || type == typeof(decimal)) return Convert.ChangeType(filled % 100 + 1, type);
        if (type.IsArray) {
            var items = Array.CreateInstance(type.GetElementType(), 2);
            for (int i = 0; i < items.Length; ++i)
                items.SetValue(Value(type.GetElementType(), name, depth), i);
            return items.GetValue(0) == null ? null : items;
        }
        return type == typeof(object) ? name : Filled(type, depth);
    }

    // Whether such an object may hold others of the type, as a filter's "and" holds expressions, without which it isn't valid.
    static bool Holds(Type holder, Type type)
    {
        return Members(holder).Any(one => (one.PropertyType.GetElementType() ?? one.PropertyType) == type);
    }

    // An object of the type, or of one derived from it, in turn. Null where the nesting ends, before which nothing is chosen that
    // would have to hold more.
    static object Filled(Type type, int depth)
    {
        if (depth == 0 || type.Namespace == "System.Xml") return null; // what the contract leaves open
        var derived = type.GetCustomAttributes<XmlIncludeAttribute>(false).Select(one => one.Type).Where(type.IsAssignableFrom);
        var choice = derived.OrderBy(one => one.FullName, StringComparer.Ordinal).Concat(type.IsAbstract ? new Type[0] : new[] {type}).ToArray();
        if (depth == 1 && choice.Any(one => !Holds(one, type)))
            choice = choice.Where(one => !Holds(one, type)).ToArray();
        var made = Activator.CreateInstance(choice[filled % choice.Length]);
        foreach (var member in Members(made.GetType()))
            member.SetValue(made, Value(member.PropertyType, member.Name, depth - 1));
        return made;
    }

    static bool IsLeaf(object value)
    {
        return value is string || value.GetType().IsValueType;
    }

    static IEnumerable<string> Differences(object sent, object got, string place)
    {
        if (sent == null) yield break;
        if (got == null)
            yield return place + " is missing";
        else if (got.GetType() != sent.GetType())
            yield return place + " is a " + got.GetType() + ", not a " + sent.GetType();
        else if (IsLeaf(sent)) {
            var same = sent is DateTime ? ((DateTime)sent).ToUniversalTime() == ((DateTime)got).ToUniversalTime() : sent.Equals(got);
            if (!same) yield return place + " is '" + got + "', not '" + sent + "'";
        } else if (sent is Array) {
            var here = ((IEnumerable)sent).Cast<object>().ToArray();
            var there = ((IEnumerable)got).Cast<object>().ToArray();
            if (here.Length != there.Length) yield return place + " has " + there.Length + " items, not " + here.Length;
            for (int i = 0; i < Math.Min(here.Length, there.Length); ++i)
                foreach (var one in Differences(here[i], there[i], place + "[" + i + "]"))
                    yield return one;
        } else
            foreach (var member in Members(sent.GetType()))
                foreach (var one in Differences(member.GetValue(sent), member.GetValue(got), place + "." + member.Name))
                    yield return one;
    }

    static object Call(SoapHttpClientProtocol client, string operation, object argument)
    {
        try {
            return client.GetType().GetMethod(operation).Invoke(client, new[] {argument});
        } catch (TargetInvocationException failure) {
            throw failure.InnerException;
        }
    }

    static void Try(Type type, string address, SoapProtocolVersion version)
    {
        var client = (SoapHttpClientProtocol)Activator.CreateInstance(type);
        var name = type.Name.Replace("SoapBinding", "");
        client.SoapVersion = version;
        client.Url = address + "/zuv/v1.0/services/" + name;
        var make = type.GetMethod("create") ?? type.GetMethod("submit");
        var header = type.GetProperty("header");
        header.SetValue(client, Activator.CreateInstance(header.PropertyType));
        var before = filled;
        var sent = Filled(make.GetParameters()[0].ParameterType, DEPTH);
        foreach (var member in Members(sent.GetType()).Where(one => OF_THE_SERVICE.Contains(one.Name)))
            member.SetValue(sent, member.PropertyType.IsValueType ? Activator.CreateInstance(member.PropertyType) : null);
        dynamic made = Call(client, make.Name, sent);
        dynamic block = Activator.CreateInstance(header.PropertyType);
        block.targetURI = made.thisURI[0];
        header.SetValue(client, block);
        var asked = Activator.CreateInstance(type.GetMethod("get").GetParameters()[0].ParameterType);
        object got = Call(client, "get", asked);
        foreach (var one in Differences(sent, got, name)) {
            ++wrong;
            Console.WriteLine(one);
        }
        Console.WriteLine(name + ", " + version + ": " + (filled - before) + " values");
        block.targetURI = "urn:nobody";
        try {
            Call(client, "get", asked);
            throw new Exception(name + ": there is no document urn:nobody");
        } catch (SoapException fault) {
            if (fault.Detail.FirstChild.LocalName != "Client.ObjectNotFound") throw;
        }
    }

    static int Main(string[] arguments)
    {
        var clients = Assembly.GetExecutingAssembly().GetTypes().Where(one => one.IsSubclassOf(typeof(SoapHttpClientProtocol)))
            .OrderBy(one => one.Name, StringComparer.Ordinal);
        foreach (var type in clients)
            foreach (var version in new[] {SoapProtocolVersion.Soap11, SoapProtocolVersion.Soap12})
                Try(type, arguments[0], version);
        return wrong == 0 && clients.Count() == 5 ? 0 : 1;
    }
}
