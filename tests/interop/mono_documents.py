#!/usr/bin/python3
"""Mono's wsdl makes C# clients of the WSDL that zuv-service hands out, and filled_documents.cs fills whole documents with them.

Usage: mono_documents.py ZUV_SERVICE SCHEMA_DIR. The service is strict: it refuses what the contract doesn't know.
"""
import os
import subprocess
import sys
import tempfile

import zuv_service

HERE = os.path.dirname(os.path.abspath(__file__))
REFERENCES = ("System.Web.Services", "System.Xml", "Microsoft.CSharp")


def main():
    with tempfile.TemporaryDirectory() as folder, zuv_service.running(sys.argv[1], "--strict") as address:
        def run(*command):
            subprocess.run(command, cwd=folder, check=True)
        run("wsdl", "-nologo", "-out:clients.cs", address + "/?wsdl")
        run("mcs", "-nologo", "-debug", "-nowarn:0108,0114", "-out:filled.exe", *("-r:" + one for one in REFERENCES), "clients.cs",
            os.path.join(HERE, "filled_documents.cs"))
        run("mono", "--debug", "filled.exe", address)


if __name__ == "__main__":
    main()
