#!/usr/bin/python3
"""A mail server on loopback for the tests: prints its port, then stores what it takes.

Each message becomes FOLDER/<n>.eml, as it came over the wire; its envelope and what is worth
knowing about its session stand before it in "X-Test-" lines.
"""
import argparse
import asyncio
import logging
import pathlib
import ssl
import warnings

from aiosmtpd.smtp import SMTP, AuthResult


class Recorder:
    def __init__(self, options):
        self.options = options
        self.count = 0

    async def handle_RCPT(self, server, session, envelope, address, rcpt_options):
        if self.options.refuse in (address, "*"):
            return f"550 5.1.1 no mailbox <{address}> here"
        envelope.rcpt_tos.append(address)
        return "250 OK"

    async def handle_DATA(self, server, session, envelope):
        await asyncio.sleep(self.options.wait)
        self.count += 1
        head = (
            f"X-Test-From: {envelope.mail_from}\r\n"
            f"X-Test-To: {','.join(envelope.rcpt_tos)}\r\n"
            f"X-Test-Port: {session.peer[1]}\r\n"
            f"X-Test-Secure: {'yes' if session.ssl else 'no'}\r\n"
        )
        path = self.options.folder / f"{self.count}.eml"
        path.write_bytes(head.encode() + envelope.original_content)
        return "250 stored"

    def check(self, server, session, envelope, mechanism, data):
        login = f"{data.login.decode()}:{data.password.decode()}"
        return AuthResult(success=login == self.options.login, handled=False)


async def serve(options):
    context = None
    if options.certificate:
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
        context.load_cert_chain(options.certificate)
    recorder = Recorder(options)
    server = await asyncio.get_running_loop().create_server(
        lambda: SMTP(recorder, hostname="test.invalid", authenticator=recorder.check,
                     auth_required=bool(options.login), auth_require_tls=False,
                     tls_context=None if options.smtps else context),
        "127.0.0.1", 0, ssl=context if options.smtps else None)
    print(server.sockets[0].getsockname()[1], flush=True)
    await server.serve_forever()


if __name__ == "__main__":
    # A log-in without TLS is meant here.
    warnings.simplefilter("ignore")
    logging.disable()
    parser = argparse.ArgumentParser()
    parser.add_argument("folder", type=pathlib.Path)
    parser.add_argument("--refuse", help="a recipient, or * for all")
    parser.add_argument("--login", help="USER:PASSWORD that must be given")
    parser.add_argument("--certificate", help="PEM file with key and certificate, for STARTTLS")
    parser.add_argument("--wait", type=int, default=0, help="seconds before a message is stored")
    parser.add_argument("--smtps", action="store_true", help="TLS from the start")
    asyncio.run(serve(parser.parse_args()))
