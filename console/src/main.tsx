import '@patternfly/react-core/dist/styles/base.css';
import './theme/base.css';
import { StrictMode } from 'react';
import { createRoot } from 'react-dom/client';
import { session } from './api/session';
import { App } from './app';
import { loadViews } from './shell/viewFile';
import { startTheme } from './theme/theme';

startTheme();

// Not all browsers know of idle times.
const whenIdle: (act: () => void) => void =
  'requestIdleCallback' in window
    ? (act) => window.requestIdleCallback(act, { timeout: 5000 })
    : (act) => setTimeout(act, 1000);
const stop = session.subscribe(() => {
  if (session.get().state !== 'active') return;
  stop();
  whenIdle(() => void loadViews());
});

const root = document.getElementById('root');
if (root !== null) {
  createRoot(root).render(
    <StrictMode>
      <App />
    </StrictMode>,
  );
}
