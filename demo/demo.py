"""The demo: a sign-in with each client in a real browser, from the device's page to the signed-in
user and out.

Runs inside scripts/sandbox; scripts/demo is what a person calls.
"""

import argparse
import contextlib
import signal
import sys

import forward
from browser import BrowserError
from narrate import Narrator
from providers.entra import Entra
from providers.glewlwyd import Glewlwyd
from providers.lemonldap import LemonLDAP
from providers.liberty import Liberty
from scene import DEVICE, PROVIDER, Scene, StepError, say, show_logs
from stage import WWW, Stage, StageError

NEXT = """
  scripts/demo --serve                  the same in your own browser, with every step explained
  scripts/demo --serve --login PROGRAM  with your own login program
  docs/integrating.md                   what a login program must do; device/ is one to copy from
  ssoclient-doctor                      on a device: finds out why a sign-in fails"""

PROVIDERS = {"glewlwyd": Glewlwyd, "lemonldap": LemonLDAP, "entra": Entra, "liberty": Liberty}


def serve(scene, narrator, profile, login, sockets):
    titles = [title for title, setup in scene.provider.setups.items() if setup[0] == profile]
    if not titles:
        raise StageError(f"{scene.provider.title} has no sign-in for the profile {profile}")
    scene.choose(titles[-1])
    forward.start(sockets)
    person = scene.person
    own = """Your login program is /webman/login.cgi there. The device's front page knows the sessions of the
reference login program alone: with yours it goes on saying that you are not signed in.
""" if login else ""
    print(f"""
The demo is running; sign-in "{titles[-1]}".
  Open        {scene.stage.device}/
  Name        {scene.provider.login_name}
  Password    {person.password}
{own}Both servers' certificates come from an authority made for this run: your browser will warn,
once for the device and once for the provider ({scene.provider.url}/).
Browsers find names below ".localhost" by themselves. If yours does not, add to the hosts file
of the machine where it runs:
  127.0.0.1 {DEVICE} {PROVIDER}
Only this machine is listened to. From another one, let ssh carry both ports:
  ssh -L {scene.stage.device_port}:127.0.0.1:{scene.stage.device_port} \
-L {scene.stage.provider_port}:127.0.0.1:{scene.stage.provider_port} USER@THIS-MACHINE
Ctrl-C ends it. What happens from now on:
""", flush=True)
    narrator.begin(scene.settings[titles[-1]])
    while True:
        signal.pause()


def visits(scene, pictures):
    """Signs in and out with each client; each step says what was seen."""
    from chromium import Chromium  # not needed, and not there, where somebody else's browser serves
    from visit import Pictures, Visit
    say("browser: Chromium, without a window")
    done = []
    with contextlib.closing(Chromium(scene.stage)) as chromium:
        for title in scene.provider.setups:
            scene.choose(title)
            visit = Visit(scene, chromium, title)
            visit.run()
            done.append(visit.outcome())
        if pictures:
            Pictures(scene, chromium, pictures).take()
    print(f"""
What happened, in Chromium, on a device and at a provider that exist in this run alone:
{chr(10).join("  " + line for line in done)}
Next:{NEXT}""", flush=True)


def read_options():
    parser = argparse.ArgumentParser()
    parser.add_argument("--prefix", required=True)
    parser.add_argument("--programs", required=True)
    parser.add_argument("--pages", required=True)
    parser.add_argument("--port", type=int, required=True)
    parser.add_argument("--provider", choices=PROVIDERS, default="glewlwyd")
    parser.add_argument("--screenshots")
    parser.add_argument("--serve", choices=("azure", "websphere"))
    parser.add_argument("--login")
    parser.add_argument("--sockets", type=int, nargs=2)
    return parser.parse_args()


def main():
    options = read_options()
    # The first process of a namespace gets no signal that it does not handle.
    for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
        signal.signal(number, signal.default_int_handler)

    stage = Stage(DEVICE, PROVIDER, options.port, options.port + 1)
    scene = Scene(stage, PROVIDERS[options.provider])
    narrator = Narrator(stage) if options.serve else None
    try:
        scene.set_up(options.prefix, options.programs, options.pages, narrator)
        if options.login:
            stage.install_login(options.login, WWW + "/webman/login.cgi", 0o4750)
        if options.serve:
            serve(scene, narrator, options.serve, options.login, options.sockets)
        else:
            visits(scene, options.screenshots)
        return 0
    except (StageError, BrowserError, StepError) as error:
        show_logs(stage)
        print(f"demo: {error}", file=sys.stderr)
        return 1
    except KeyboardInterrupt:
        return 130
    finally:
        stage.close()


if __name__ == "__main__":
    sys.exit(main())
