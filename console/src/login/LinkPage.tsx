import { useEffect, useState } from 'react';
import { logInByLink } from '../api/client';
import { t } from '../texts';
import { hrefOf, kHome, navigate } from '../shell/router';
import { ConnectionBanner, Loading } from '../ui';

// A link works once: it must not be sent twice when the view is drawn twice.
const sent = new Set<string>();

interface LinkPageProps {
  token: string;
  onFailed: (error: unknown) => void;
}

// Logs in with the one-time link that the page was opened with. The token leaves the address, and so the browser's
// history, at once.
export function LinkPage({ token, onFailed }: LinkPageProps) {
  const [text] = useState(() => t('login.link.running'));
  useEffect(() => {
    if (sent.has(token)) return;
    sent.add(token);
    window.history.replaceState(null, '', hrefOf(kHome));
    logInByLink(token)
      .catch(onFailed)
      .finally(() => navigate(kHome, { replace: true }));
  }, [token, onFailed]);
  return (
    <main className="vorn-starting">
      <ConnectionBanner />
      <Loading text={text} />
    </main>
  );
}
