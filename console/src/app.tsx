import { useEffect, useState } from 'react';
import { loadSession } from './api/client';
import { connection } from './api/connection';
import { session } from './api/session';
import { useStore } from './api/store';
import { LinkPage } from './login/LinkPage';
import { LoginPage } from './login/LoginPage';
import { kHome, navigate, useRoute } from './shell/router';
import { Shell } from './shell/Shell';
import { Starting } from './shell/Starting';

// Which the page is: not known yet, a one-time link at work, log-in, or the views.
export function App() {
  const { state } = useStore(session);
  const lost = useStore(connection).state === 'lost';
  const { segments } = useRoute();
  const [error, setError] = useState<unknown>(undefined);
  const [linkError, setLinkError] = useState<unknown>(undefined);
  const [round, setRound] = useState(0);
  const token = segments[0] === 'link' ? segments[1] : undefined;
  const waits = state === 'unknown' && !lost && token === undefined;

  useEffect(() => {
    if (!waits) return;
    const stop = new AbortController();
    setError(undefined);
    loadSession({ signal: stop.signal }).catch((failure: unknown) => {
      if (!stop.signal.aborted) setError(failure);
    });
    return () => stop.abort();
  }, [waits, round]);
  useEffect(() => {
    if (state !== 'active') return;
    setLinkError(undefined);
    if (segments[0] === 'login') navigate(kHome, { replace: true });
  }, [state, segments]);

  if (token !== undefined) return <LinkPage token={token} onFailed={setLinkError} />;
  if (state === 'unknown') return <Starting error={error} onRetry={() => setRound(round + 1)} />;
  return state === 'active' ? <Shell /> : <LoginPage linkError={linkError} />;
}
