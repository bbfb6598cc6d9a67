import { Card, CardBody, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import { useEffect } from 'react';
import { session } from '../api/session';
import { useStore } from '../api/store';
import icon from '../icon.svg';
import { t } from '../texts';
import { ConnectionBanner } from '../ui';
import { LoginForm } from './LoginForm';
import './login.css';

// Who is not logged in sees this, whatever the address: afterwards the view of the address comes.
export function LoginPage({ linkError }: { linkError?: unknown }) {
  const now = useStore(session);
  const ended = now.state === 'none' && now.ended;
  useEffect(() => {
    document.title = t('login.title');
  }, []);
  return (
    <main className="vorn-login">
      <Card className="vorn-login__card" component="section" aria-labelledby="login-title">
        <CardTitle>
          <div className="vorn-login__head">
            <img src={icon} alt="" width="40" height="40" />
            <div>
              <h1 id="login-title" className="vorn-login__title">
                {t('login.title')}
              </h1>
              <p className="vorn-login__host">{t('login.to', { host: window.location.hostname })}</p>
            </div>
          </div>
        </CardTitle>
        <CardBody>
          <ConnectionBanner />
          <LoginForm ended={ended} linkError={linkError} />
        </CardBody>
      </Card>
    </main>
  );
}
